// The subcommands of varnel. Each adds itself to the application and leaves its
// exit status in `status` when it has run.
#pragma once

#include <CLI/CLI.hpp>

#include <string>

#include "varnel/readings.h"
#include "session.h"
#include "varnel/xml_wrapper.h"

namespace varnel::cli {

// The options every meter command takes. A command whose own --record means
// something else names the capture option --record-session alone.
void addMeterOptions(CLI::App* cmd, MeterOptions& o, const std::string& recordNames = "--record,--record-session");
CLI::Option* addOutputOption(CLI::App* cmd, std::string& output);
// Writes a command's result; a failure ends the run without touching the meter again.
void emit(const std::string& path, const std::string& text);
// A document as the text of an XML file.
std::string xmlText(const XMLWrapper& doc);

// The meter's readings as a datalog document; a failed upload ends the run.
XMLWrapper uploadDatalog(MeterSession& s);
// --unit: glucose in mg/dL ("mgdl") or mmol/L ("mmol").
CLI::Option* addUnitOption(CLI::App* cmd, std::string& unit);
GlucoseUnit glucoseUnit(const std::string& option);

// The examples of one command's --help; of every command for "".
std::string examplesHelp(const std::string& command = "");
// What `varnel --help` says about exit statuses.
std::string exitStatusHelp();

// `varnel codes`: every return code with its text.
void addCodesCommand(CLI::App& app, int& status);
// `varnel discover`, `varnel readings`, `varnel clear`.
void addMeterCommands(CLI::App& app, int& status);

}  // namespace varnel::cli
