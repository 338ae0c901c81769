// `varnel settings` and `varnel clock`: the meter's settings document, and
// its clock beside the computer's.
#pragma once

#include <CLI/CLI.hpp>

#include <functional>
#include <string>
#include <vector>

#include "meter_clock.h"
#include "session.h"

namespace varnel::cli {

// Sets the meter clock to a time, for `varnel clock --sync` and `--set`.
using ClockSetter = std::function<void(MeterSession&, const LocalTime&)>;

// Adds `settings` and `clock`; `clock` takes --sync and --set only when setClock is given.
void addSettingsCommands(CLI::App& app, int& status, ClockSetter setClock = nullptr);

// Reads the listed items (all when none are listed) into a settings document, showing
// progress under `label`. Items the meter does not offer go to notes; a request of which
// none is offered fails.
XMLWrapper readSettings(MeterSession& s, const std::vector<std::string>& items, std::vector<std::string>& notes,
                        const std::string& label = "settings");

// The settings document `xml` without the items the meter only reports (Mode="0"), whose
// names go to `dropped`: what is left is what setDeviceSettings takes.
std::string withoutReadOnlyItems(const std::string& xml, std::vector<std::string>& dropped);

// Reads the meter clock and prints it beside the computer clock, with the difference,
// and warns when the meter clock is off.
void showClock(MeterSession& s);

}  // namespace varnel::cli
