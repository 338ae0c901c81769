// `varnel validate FILE`: checks a document against the schema of its document element.
#pragma once

#include <CLI/CLI.hpp>

namespace varnel::cli {

void addValidateCommand(CLI::App& app, int& status);

}  // namespace varnel::cli
