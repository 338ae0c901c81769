// `varnel validate FILE`: checks a document against the schema of its document element.
#pragma once

#include <CLI/CLI.hpp>

#include <string>

namespace varnel::cli {

// Where the schemas are: $VARNEL_SCHEMAS, else share/varnel/schemas beside the command's bin/.
std::string schemaDirectory();

void addValidateCommand(CLI::App& app, int& status);

}  // namespace varnel::cli
