// LoadXML against a well-kept parser: within the component's limits, a text is
// a document for LoadXML exactly when it is one for libxml2 (no network, no
// entity expansion, read as UTF-8). A disagreement aborts with both verdicts.
// libxml2 takes a zero byte after the document element for the end of the
// input; XML has no such character, so a text holding one is no document.
// The deliberate differences: LoadXML refuses a DOCTYPE with an internal
// subset (so no entity is ever declared) and a declared encoding other than
// UTF-8 (every text is read as UTF-8), which libxml2 may read; such texts are
// left out of the comparison.
#include <libxml/parser.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "varnel/component_error.h"
#include "varnel/xml_wrapper.h"

namespace {

// Nesting deeper than the component's limit cannot occur with this few tags.
constexpr std::size_t kMaxTags = 256;

void quiet(void*, const char*, ...) {}

// "" when libxml2 reads the text as a well-formed document; else its first error.
std::string libxml2Verdict(const std::string& text) {
    xmlResetLastError();
    xmlDocPtr doc = xmlReadMemory(text.data(), static_cast<int>(text.size()), "input.xml", "UTF-8",
                                  XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING);
    if (doc) {
        xmlFreeDoc(doc);
        return "";
    }
    const xmlError* e = xmlGetLastError();
    return e && e->message ? e->message : "rejected";
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
    xmlInitParser();
    xmlSetGenericErrorFunc(nullptr, quiet);
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), size);
    if (static_cast<std::size_t>(std::count(text.begin(), text.end(), '<')) > kMaxTags) return 0;

    varnel::XMLWrapper doc;
    bool ours = false;
    std::string why;
    try {
        ours = doc.LoadXML(text);
        if (!ours) why = doc.LastLoadError();
    } catch (const varnel::ComponentError& e) {
        why = "ComponentError " + e.description();
    }
    if (!ours && (why.find("internal subset") != std::string::npos ||
                  why.find("documents are UTF-8") != std::string::npos))
        return 0;
    const std::string theirs =
        text.find('\0') != std::string::npos ? "a zero byte is no XML character" : libxml2Verdict(text);
    if (ours != theirs.empty()) {
        std::fprintf(stderr, "LoadXML %s, libxml2 %s\n", ours ? "accepts" : ("refuses (" + why + ")").c_str(),
                     theirs.empty() ? "accepts" : ("refuses (" + theirs + ")").c_str());
        std::abort();
    }
    return 0;
}
