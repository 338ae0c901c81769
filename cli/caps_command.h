// `varnel caps`: what the meter can do, as a capabilities document.
#pragma once

#include <CLI/CLI.hpp>

namespace varnel::cli {

// Adds `caps`: everything the meter type offers, or only the settings and
// record kinds named with --item and --record.
void addCapsCommand(CLI::App& app, int& status);

}  // namespace varnel::cli
