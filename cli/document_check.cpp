#include "document_check.h"

#include <libxml/parser.h>
#include <libxml/xmlerror.h>
#include <libxml/xmlschemas.h>

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <system_error>

namespace varnel::cli {

namespace {

namespace fs = std::filesystem;

void collect(void* problems, xmlErrorPtr error) {
    std::string message = error->message ? error->message : "unknown problem";
    while (!message.empty() && message.back() == '\n') message.pop_back();
    static_cast<std::vector<std::string>*>(problems)->push_back("line " + std::to_string(error->line) + ": " +
                                                                 message);
}

template <class T, void (*Free)(T*)>
struct Freer {
    void operator()(T* p) const { Free(p); }
};
using Document = std::unique_ptr<xmlDoc, Freer<xmlDoc, xmlFreeDoc>>;
using SchemaParser = std::unique_ptr<xmlSchemaParserCtxt, Freer<xmlSchemaParserCtxt, xmlSchemaFreeParserCtxt>>;
using Schema = std::unique_ptr<xmlSchema, Freer<xmlSchema, xmlSchemaFree>>;
using Validator = std::unique_ptr<xmlSchemaValidCtxt, Freer<xmlSchemaValidCtxt, xmlSchemaFreeValidCtxt>>;

// Routes libxml2's reports into a list for as long as it lives.
struct ReportsTo {
    explicit ReportsTo(std::vector<std::string>& problems) { xmlSetStructuredErrorFunc(&problems, collect); }
    ~ReportsTo() { xmlSetStructuredErrorFunc(nullptr, nullptr); }
};

}  // namespace

std::string schemaDirectory() {
    if (const char* dir = std::getenv("VARNEL_SCHEMAS"); dir && *dir) return dir;
    std::error_code ec;
    const fs::path self = fs::read_symlink("/proc/self/exe", ec);
    return (self.parent_path().parent_path() / "share" / "varnel" / "schemas").string();
}

DocumentCheck checkDocument(const std::string& xml, const std::string& schemaDir) {
    using Verdict = DocumentCheck::Verdict;
    DocumentCheck check;
    ReportsTo reports(check.problems);
    // No network and no entity expansion: the document is read as the component reads it.
    Document doc(xmlReadMemory(xml.data(), static_cast<int>(xml.size()), "document", nullptr, XML_PARSE_NONET));
    if (!doc) return check;
    const xmlNode* root = xmlDocGetRootElement(doc.get());
    const std::string element = root ? reinterpret_cast<const char*>(root->name) : "";
    const fs::path schema = fs::path(schemaDir) / (element + ".xsd");
    std::error_code ec;
    // Common.xsd holds shared types, no document.
    if (element.empty() || element == "Common" || !fs::is_regular_file(schema, ec)) {
        check.verdict = Verdict::no_schema;
        return check;
    }
    check.schema = schema.string();

    SchemaParser parser(xmlSchemaNewParserCtxt(check.schema.c_str()));
    Schema compiled(parser ? xmlSchemaParse(parser.get()) : nullptr);
    Validator validator(compiled ? xmlSchemaNewValidCtxt(compiled.get()) : nullptr);
    if (!validator) {
        check.verdict = Verdict::schema_unusable;
        return check;
    }
    check.problems.clear();
    xmlSchemaSetValidStructuredErrors(validator.get(), collect, &check.problems);
    const int result = xmlSchemaValidateDoc(validator.get(), doc.get());
    check.verdict = result == 0 ? Verdict::valid : Verdict::invalid;
    // A document that fails without a message still says so.
    if (result != 0 && check.problems.empty()) check.problems.push_back("line 0: not valid");
    return check;
}

}  // namespace varnel::cli
