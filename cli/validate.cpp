#include "validate.h"

#include <libxml/parser.h>
#include <libxml/xmlerror.h>
#include <libxml/xmlschemas.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <system_error>
#include <vector>

#include "session.h"

namespace varnel::cli {

namespace {

namespace fs = std::filesystem;

// Problems libxml2 reports, each as "line N: message".
struct Problems {
    std::vector<std::string> lines;
    static void collect(void* self, xmlErrorPtr error) {
        std::string message = error->message ? error->message : "unknown problem";
        while (!message.empty() && message.back() == '\n') message.pop_back();
        static_cast<Problems*>(self)->lines.push_back("line " + std::to_string(error->line) + ": " + message);
    }
};

template <class T, void (*Free)(T*)>
struct Freer {
    void operator()(T* p) const { Free(p); }
};
using Document = std::unique_ptr<xmlDoc, Freer<xmlDoc, xmlFreeDoc>>;
using SchemaParser = std::unique_ptr<xmlSchemaParserCtxt, Freer<xmlSchemaParserCtxt, xmlSchemaFreeParserCtxt>>;
using Schema = std::unique_ptr<xmlSchema, Freer<xmlSchema, xmlSchemaFree>>;
using Validator = std::unique_ptr<xmlSchemaValidCtxt, Freer<xmlSchemaValidCtxt, xmlSchemaFreeValidCtxt>>;

// Routes libxml2's reports into a Problems for as long as it lives.
struct ReportsTo {
    explicit ReportsTo(Problems& p) { xmlSetStructuredErrorFunc(&p, &Problems::collect); }
    ~ReportsTo() { xmlSetStructuredErrorFunc(nullptr, nullptr); }
};

int validate(const std::string& file) {
    Problems problems;
    ReportsTo reports(problems);
    // No network and no entities: a document is checked as the component reads it.
    Document doc(xmlReadFile(file.c_str(), nullptr, XML_PARSE_NONET));
    if (!doc) {
        say(file + " is not an XML document");
        for (const std::string& line : problems.lines) std::printf("%s\n", line.c_str());
        return exit_status::usage;
    }
    const xmlNode* root = xmlDocGetRootElement(doc.get());
    const std::string element = root ? reinterpret_cast<const char*>(root->name) : "";
    const fs::path schema = fs::path(schemaDirectory()) / (element + ".xsd");
    std::error_code ec;
    if (element.empty() || !fs::is_regular_file(schema, ec) || element == "Common") {
        say("no schema for the document element '" + element + "' in " + schemaDirectory());
        return exit_status::usage;
    }
    std::printf("schema %s\n", schema.filename().c_str());

    SchemaParser parser(xmlSchemaNewParserCtxt(schema.c_str()));
    Schema compiled(parser ? xmlSchemaParse(parser.get()) : nullptr);
    if (!compiled) {
        say("the schema " + schema.string() + " does not load");
        return exit_status::local_failure;
    }
    problems.lines.clear();
    Validator validator(xmlSchemaNewValidCtxt(compiled.get()));
    if (!validator) {
        say("the schema " + schema.string() + " does not load");
        return exit_status::local_failure;
    }
    xmlSchemaSetValidStructuredErrors(validator.get(), &Problems::collect, &problems);
    const int result = xmlSchemaValidateDoc(validator.get(), doc.get());
    if (result == 0) {
        std::printf("valid\n");
        return exit_status::success;
    }
    for (const std::string& line : problems.lines) std::printf("%s\n", line.c_str());
    if (problems.lines.empty()) std::printf("not valid\n");
    return exit_status::usage;
}

}  // namespace

std::string schemaDirectory() {
    if (const char* dir = std::getenv("VARNEL_SCHEMAS"); dir && *dir) return dir;
    std::error_code ec;
    const fs::path self = fs::read_symlink("/proc/self/exe", ec);
    return (self.parent_path().parent_path() / "share" / "varnel" / "schemas").string();
}

void addValidateCommand(CLI::App& app, int& status) {
    auto* cmd = app.add_subcommand("validate", "Check a document against the schema its document element names");
    auto file = std::make_shared<std::string>();
    cmd->add_option("FILE", *file, "The XML document")->required();
    cmd->footer("Prints the schema used, then \"valid\" or each problem with its line.\n"
                "Schemas are looked for in $VARNEL_SCHEMAS, else in share/varnel/schemas beside bin/.");
    cmd->callback([file, &status] { status = validate(*file); });
}

}  // namespace varnel::cli
