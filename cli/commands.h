// The subcommands of varnel. Each adds itself to the application and leaves its
// exit status in `status` when it has run.
#pragma once

#include <CLI/CLI.hpp>

#include <string>

namespace varnel::cli {

// What `varnel --help` says about exit statuses.
std::string exitStatusHelp();

// `varnel codes`: every return code with its text.
void addCodesCommand(CLI::App& app, int& status);
// `varnel discover`, `varnel readings`, `varnel clear`.
void addMeterCommands(CLI::App& app, int& status);

}  // namespace varnel::cli
