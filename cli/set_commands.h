// Writing settings to the meter: `varnel set FILE` and the clock synchronisation.
#pragma once

#include <CLI/CLI.hpp>

#include "session.h"

namespace varnel::cli {

// `varnel set FILE`: applies a device configuration document.
void addSetCommand(CLI::App& app, int& status);

// Sets the meter clock to the computer's local time through setDeviceSettings;
// a refusal is reported and ends the run with its code made positive.
void syncMeterClock(MeterSession& s);

}  // namespace varnel::cli
