#include "validate.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <regex>
#include <string>

#include "document_check.h"
#include "session.h"
#include "varnel/component_error.h"

namespace varnel::cli {

namespace {

int validate(const std::string& file) {
    XMLWrapper doc;
    const DocumentCheck check = checkFile(file, doc);
    using Verdict = DocumentCheck::Verdict;
    switch (check.verdict) {
    case Verdict::unreadable:
        say(file + ": cannot be read: " + check.problems.front());
        return exit_status::bad_input;
    case Verdict::not_xml:
        say(file + ": not an XML document");
        break;
    case Verdict::no_schema:
        say(file + ": no schema in " + schemaDirectory() + " for its document element");
        return exit_status::bad_input;
    case Verdict::schema_unusable:
        say("the schema " + check.schema + " does not load");
        return exit_status::local_failure;
    case Verdict::valid:
    case Verdict::invalid:
        std::printf("schema %s\n", std::filesystem::path(check.schema).filename().c_str());
        if (check.verdict == Verdict::valid) std::printf("valid\n");
        break;
    }
    for (const std::string& line : check.problems) std::printf("%s\n", line.c_str());
    return check.verdict == Verdict::valid ? exit_status::success : exit_status::bad_input;
}

}  // namespace

DocumentCheck checkFile(const std::string& file, XMLWrapper& doc) {
    DocumentCheck check;
    try {
        if (!doc.LoadFile(file)) {
            // "what at line L, offset O" as every other problem reads: "line L: what, offset O".
            const std::string why = doc.LastLoadError();
            std::smatch part;
            const bool placed = std::regex_match(why, part, std::regex("(.*) at line ([0-9]+), (offset [0-9]+)"));
            check.problems.push_back(placed ? "line " + part[2].str() + ": " + part[1].str() + ", " + part[3].str() : why);
            return check;
        }
    } catch (const ComponentError& e) {
        check.verdict = DocumentCheck::Verdict::unreadable;
        check.problems.push_back(e.description());
        return check;
    }
    std::ifstream in(file, std::ios::binary);
    return checkDocument({std::istreambuf_iterator<char>(in), {}}, schemaDirectory());
}

void addValidateCommand(CLI::App& app, int& status) {
    auto* cmd = app.add_subcommand("validate", "Check a document against the schema its document element names");
    auto file = std::make_shared<std::string>();
    cmd->add_option("FILE", *file, "The XML document")->required()->check(CLI::ExistingFile);
    cmd->footer("Prints the schema used, then \"valid\" or each problem with its line: a value outside its\n"
                "schema or outside the Min and Max the document gives it. A document the component would\n"
                "not read ('varnel set' refuses it) is not valid either.\n"
                "Schemas are looked for in $VARNEL_SCHEMAS, else in share/varnel/schemas beside bin/.");
    cmd->callback([file, &status] { status = validate(*file); });
}

}  // namespace varnel::cli
