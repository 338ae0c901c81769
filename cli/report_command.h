// `varnel report` and `varnel summary`: the glucose summary of the meter's readings.
#pragma once

#include <CLI/CLI.hpp>

namespace varnel::cli {

void addReportCommands(CLI::App& app, int& status);

}  // namespace varnel::cli
