#include "document_check.h"

#include <libxml/parser.h>
#include <libxml/xmlerror.h>
#include <libxml/xmlschemas.h>

#include <cstdio>
#include <cstdlib>
#include <optional>
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

std::string attribute(const xmlNode* node, const char* name) {
    xmlChar* value = xmlGetProp(node, reinterpret_cast<const xmlChar*>(name));
    if (!value) return {};
    std::string text = reinterpret_cast<const char*>(value);
    xmlFree(value);
    return text;
}

std::string trimmed(const std::string& text) {
    const auto first = text.find_first_not_of(" \t\r\n");
    if (first == std::string::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

// A number as the component reads one: an optional sign, digits with at most one point, blanks around.
std::optional<double> decimalIn(const std::string& given) {
    const std::string text = trimmed(given);
    if (text.empty()) return std::nullopt;
    const std::size_t digits = text.find_first_of("+-") == 0 ? 1 : 0;
    if (digits == text.size() || text.find_first_not_of("0123456789.", digits) != std::string::npos ||
        text.find('.') != text.rfind('.') || text == "." || text.substr(digits) == ".")
        return std::nullopt;
    return std::strtod(text.c_str(), nullptr);
}

// The element's own text, its text children joined.
std::string ownText(const xmlNode* node) {
    std::string text;
    for (const xmlNode* c = node->children; c; c = c->next)
        if ((c->type == XML_TEXT_NODE || c->type == XML_CDATA_SECTION_NODE) && c->content)
            text += reinterpret_cast<const char*>(c->content);
    return text;
}

const xmlNode* childNamed(const xmlNode* node, const char* name) {
    for (const xmlNode* c = node->children; c; c = c->next)
        if (c->type == XML_ELEMENT_NODE && std::string(reinterpret_cast<const char*>(c->name)) == name) return c;
    return nullptr;
}

// "YYYY-MM-DD" of an element's Y, MM and D attributes; "" when one is no number.
std::string dateOf(const xmlNode* node) {
    const auto y = decimalIn(attribute(node, "Y")), m = decimalIn(attribute(node, "MM")), d = decimalIn(attribute(node, "D"));
    if (!y || !m || !d) return {};
    char text[48];
    std::snprintf(text, sizeof text, "%04d-%02d-%02d", static_cast<int>(*y), static_cast<int>(*m), static_cast<int>(*d));
    return text;
}

// Values outside the limits the document itself gives: an item's Min and Max attributes, the clock's Min and Max.
void checkOwnLimits(const xmlNode* node, std::vector<std::string>& problems) {
    for (; node; node = node->next) {
        if (node->type != XML_ELEMENT_NODE) continue;
        const std::string name = reinterpret_cast<const char*>(node->name);
        const std::string line = "line " + std::to_string(xmlGetLineNo(node)) + ": ";
        const auto min = decimalIn(attribute(node, "Min")), max = decimalIn(attribute(node, "Max"));
        const std::string text = ownText(node);
        if (const auto value = decimalIn(text); min && max && value && (*value < *min || *value > *max))
            problems.push_back(line + name + " " + trimmed(text) + " is outside its own range " +
                               attribute(node, "Min") + " to " + attribute(node, "Max"));
        if (name == "Clock") {
            const xmlNode* val = childNamed(node, "Val");
            const xmlNode* first = childNamed(node, "Min");
            const xmlNode* last = childNamed(node, "Max");
            const std::string date = val ? dateOf(val) : "";
            if (!date.empty() && first && last && !dateOf(first).empty() && !dateOf(last).empty() &&
                (date < dateOf(first) || date > dateOf(last)))
                problems.push_back(line + "Clock " + date + " is outside its own range " + dateOf(first) + " to " +
                                   dateOf(last));
        }
        checkOwnLimits(node->children, problems);
    }
}

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
    // Read as UTF-8 whatever the declaration says, as the component reads it.
    Document doc(xmlReadMemory(xml.data(), static_cast<int>(xml.size()), "document", "UTF-8", XML_PARSE_NONET));
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
    // A document that fails without a message still says so.
    if (result != 0 && check.problems.empty()) check.problems.push_back("line 0: not valid");
    const std::size_t schemaProblems = check.problems.size();
    checkOwnLimits(root, check.problems);
    check.verdict = result == 0 && check.problems.size() == schemaProblems ? Verdict::valid : Verdict::invalid;
    return check;
}

}  // namespace varnel::cli
