// `varnel settings` and `varnel clock`: the meter's settings document, and
// its clock beside the computer's.
#pragma once

#include <CLI/CLI.hpp>

#include <functional>

#include "session.h"

namespace varnel::cli {

// Sets the meter clock to the computer clock, for `varnel clock --sync`.
using ClockSetter = std::function<void(MeterSession&)>;

// Adds `settings` and `clock`; `clock` takes --sync only when setClock is given.
void addSettingsCommands(CLI::App& app, int& status, ClockSetter setClock = nullptr);

// Reads the meter clock and prints it beside the computer clock, with the difference.
void showClock(MeterSession& s);

}  // namespace varnel::cli
