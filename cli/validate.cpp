#include "validate.h"

#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>

#include "document_check.h"
#include "session.h"

namespace varnel::cli {

namespace {

int validate(const std::string& file) {
    std::ifstream in(file, std::ios::binary);
    if (!in) {
        say(file + ": cannot be read");
        return exit_status::bad_input;
    }
    const std::string xml{std::istreambuf_iterator<char>(in), {}};
    const std::string dir = schemaDirectory();
    const DocumentCheck check = checkDocument(xml, dir);
    using Verdict = DocumentCheck::Verdict;
    switch (check.verdict) {
    case Verdict::not_xml:
        say(file + ": not an XML document");
        break;
    case Verdict::no_schema:
        say(file + ": no schema in " + dir + " for its document element");
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

void addValidateCommand(CLI::App& app, int& status) {
    auto* cmd = app.add_subcommand("validate", "Check a document against the schema its document element names");
    auto file = std::make_shared<std::string>();
    cmd->add_option("FILE", *file, "The XML document")->required()->check(CLI::ExistingFile);
    cmd->footer("Prints the schema used, then \"valid\" or each problem with its line.\n"
                "Schemas are looked for in $VARNEL_SCHEMAS, else in share/varnel/schemas beside bin/.");
    cmd->callback([file, &status] { status = validate(*file); });
}

}  // namespace varnel::cli
