// `varnel info`: the meter in plain words, one fact a line.
#pragma once

#include <CLI/CLI.hpp>

namespace varnel::cli {

void addInfoCommand(CLI::App& app, int& status);

}  // namespace varnel::cli
