// Writing settings to the meter: `varnel set FILE` and the clock synchronisation.
#pragma once

#include <CLI/CLI.hpp>

#include "meter_clock.h"
#include "session.h"

namespace varnel::cli {

// `varnel set FILE`: applies a device configuration document.
void addSetCommand(CLI::App& app, int& status);

// Sets the meter clock to `time` through setDeviceSettings; a refusal is reported,
// with the range of times the meter holds, and ends the run with its code made positive.
void setMeterClock(MeterSession& s, const LocalTime& time);

}  // namespace varnel::cli
