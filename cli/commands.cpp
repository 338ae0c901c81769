#include "commands.h"

#include <algorithm>
#include <cstdio>
#include <memory>

#include "documents.h"
#include "varnel/readings.h"
#include "interrupt.h"
#include "output.h"
#include "session.h"
#include "settings_commands.h"
#include "varnel/records.h"
#include "varnel/return_codes.h"

namespace varnel::cli {

void addMeterOptions(CLI::App* cmd, MeterOptions& o, const std::string& recordNames) {
    // A port the component could not search is a wrong command line, found before the meter is touched.
    cmd->add_option("--port", o.port, "Serial port to search for the meter (1-255)")
        ->check(CLI::Range(1, 255))
        ->capture_default_str();
    cmd->add_option("--transport", o.transport, "Transport library to load instead of the simulated one")
        ->type_name("PATH");
    auto* type = cmd->add_option("--sim-type", o.simType, "Attach the simulated meter of this type (1-8)")
                     ->check(CLI::Range(1, 8));
    cmd->add_option("--sim-profile", o.simProfile, "Attach the simulated meter described by a profile file")
        ->type_name("FILE")
        ->excludes(type);
    auto* profile = cmd->get_option("--sim-profile");
    auto* save = cmd->add_option("--sim-save", o.simSave,
                                 "Afterwards, write the simulated meter as it is then to a profile file "
                                 "(attach it again with --sim-profile)")
                     ->type_name("FILE");
    auto* record = cmd->add_option(recordNames, o.record,
                                   "Write every call to the transport library to a capture file (docs/capture.md)")
                       ->type_name("FILE");
    cmd->add_option("--replay", o.replay, "Answer from a capture file instead of a meter")
        ->type_name("FILE")
        ->excludes(record)
        ->excludes(type)
        ->excludes(profile)
        ->excludes(save)
        ->excludes(cmd->get_option("--transport"));
    cmd->add_flag("-q,--quiet", o.quiet, "Show no progress");
}

CLI::Option* addOutputOption(CLI::App* cmd, std::string& output) {
    // Checked once the command line is read, before the meter is touched.
    cmd->parse_complete_callback([&output] {
        const std::string why = unwritableReason(output);
        if (why.empty()) return;
        say("cannot write " + output + ": " + why);
        throw RunEnd{exit_status::cannot_create};
    });
    return cmd->add_option("-o,--output", output, "Write to FILE instead of standard output")->type_name("FILE");
}

void emit(const std::string& path, const std::string& text) {
    try {
        writeOutput(path, text);
    } catch (const OutputError& e) {
        say(e.what());
        if (const int signal = interruption()) throw RunEnd{interruptedStatus(signal)};
        throw RunEnd{exit_status::local_failure};
    }
}

std::string xmlText(const XMLWrapper& doc) {
    std::string text = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n" + doc.XML();
    if (text.back() != '\n') text += '\n';
    return text;
}

namespace {

// Options of the meter commands; one command runs per invocation, so they share one set.
struct CommandLine {
    MeterOptions meter;
    std::string output;
    bool csv = false;
    bool json = false;
    std::string unit = "mgdl";
    bool clearAfter = false;
    bool yes = false;
};

void readings(MeterSession& s, const CommandLine& cl) {
    warnAboutMeterClock(s);
    XMLWrapper datalog = uploadDatalog(s);
    const GlucoseUnit unit = glucoseUnit(cl.unit);
    if (cl.csv)
        emit(cl.output, readingsCsv(readDatalog(datalog.XML()), unit));
    else if (cl.json)
        emit(cl.output, readingsJson(readDatalog(datalog.XML()), unit));
    else
        emit(cl.output, xmlText(datalog));
    // Only readings that are safely on disk may be erased from the meter.
    if (!cl.clearAfter) return;
    s.clearMeter();
    if (!cl.meter.quiet)
        say("readings saved to " + cl.output + "; meter " + sectionValue(s.deviceInfo(), "DeviceInfo", "SN") +
            " erased");
}

}  // namespace

XMLWrapper uploadDatalog(MeterSession& s) {
    XMLWrapper datalog = emptyDocument(doc_kind::datalog);
    XMLWrapper filter = emptyDocument(doc_kind::filter);
    bool checked = false;
    s.request("readings", [&](XMLWrapper& status) {
        return s.wrapper().getReadings(s.record(), s.deviceInfo(), datalog, filter, status, checked);
    });
    return datalog;
}

CLI::Option* addUnitOption(CLI::App* cmd, std::string& unit) {
    return cmd->add_option("--unit", unit, "Glucose in mg/dL as the meter stores it, or converted to mmol/L")
        ->check(CLI::IsMember({"mgdl", "mmol"}))
        ->capture_default_str();
}

GlucoseUnit glucoseUnit(const std::string& option) { return option == "mmol" ? GlucoseUnit::mmol : GlucoseUnit::meter; }

namespace {

// The examples `varnel --help` lists, each also under its own command's --help.
const struct Example {
    const char* command;
    const char* line;
    const char* says;
} kExamples[] = {
    {"info", "varnel info", "the meter in plain words, and whether its clock is right"},
    {"info", "varnel info --records", "the same, with the records counted by an upload"},
    {"discover", "varnel discover --sim-type 4", "describe the simulated type-4 meter"},
    {"readings", "varnel readings --csv -o readings.csv", "the readings, one CSV line each"},
    {"readings", "varnel readings --json --unit mmol", "the readings as JSON, glucose in mmol/L"},
    {"readings", "varnel readings -o log.xml --clear-after", "save the datalog, then erase the meter"},
    {"report", "varnel report -o report.html", "a printable glucose report with charts"},
    {"summary", "varnel summary --unit mmol", "the report's summary table as text"},
    {"validate", "varnel validate cfg.xml", "check a document against its schema and its own limits"},
    {"caps", "varnel caps --sim-type 3", "what the meter can do: settings, limits, record kinds"},
    {"caps", "varnel caps --item Clock --record Gluc", "the clock range and the range of the glucose field"},
    {"settings", "varnel settings --sim-type 3", "the settings document of the simulated type-3 meter"},
    {"settings", "varnel settings --writable -o cfg.xml", "only the settings 'varnel set' can write back"},
    {"set", "varnel set cfg.xml", "write an edited settings document back to the meter"},
    {"set", "varnel set --force cfg.xml", "write it even where it breaks its schema or its limits"},
    {"clock", "varnel clock", "the meter clock beside the computer clock"},
    {"clock", "varnel clock --sync --sim-type 5", "set the meter clock to the computer clock"},
    {"clock", "varnel clock --set \"2010-05-01 08:30:00\"", "set the meter clock to that local time"},
    {"clear", "varnel clear --yes", "erase every reading stored in the meter"},
    {"codes", "varnel codes", "every return code with its text"},
};

}  // namespace

std::string examplesHelp(const std::string& command) {
    std::string text = "Examples:\n";
    for (const Example& e : kExamples) {
        if (!command.empty() && command != e.command) continue;
        std::string line = std::string("  ") + e.line;
        line.resize(std::max<std::size_t>(line.size() + 2, 44), ' ');
        text += line + e.says + "\n";
    }
    return text + "\n";
}

std::string exitStatusHelp() {
    return "Exit status:\n"
           "  0       success\n"
           "  1-62    a request failed: its return code made positive (-13 exits with 13);\n"
           "          'varnel codes' lists the codes, and each status description is printed\n"
           "          on standard error as one line 'varnel: <text>'\n"
           "  63      a request failed with a code outside -1..-62\n"
           "  64      a wrong command line (an unknown option, a --port outside 1-255, an\n"
           "          invalid VARNEL_NOW), a --transport library that cannot be loaded, or\n"
           "          'clear' without --yes; the meter is not touched\n"
           "  65      'set' or 'validate' was given a FILE that cannot be read, is not an XML\n"
           "          document varnel reads, has no schema or does not keep to it or to the\n"
           "          Min and Max it gives an item ('set' also: not a DeviceSettings document)\n"
           "  70      the component failed unexpectedly (ComponentError: its number and\n"
           "          routine trace are printed)\n"
           "  73      the -o or --sim-save file cannot be written (found before the meter\n"
           "          is touched)\n"
           "  74      varnel itself failed: the simulated meter could not be set up, or the\n"
           "          output could not be written (the meter is then not erased)\n"
           "  130     stopped by Ctrl-C (SIGINT), 143 by SIGTERM: the running step ends, the\n"
           "          meter is released and no partial output file is left\n";
}

void addCodesCommand(CLI::App& app, int& status) {
    auto* codes = app.add_subcommand("codes", "List every return code with its text");
    codes->callback([&status] {
        for (int code = 0; code >= ME_INVALID_HANDLE; --code) {
            const std::string text = returnCodeText(code);
            if (code != ME_SUCCESS && text == "Unknown status" && code != ME_UNKNOWN && code != ME_CLOCK_ERROR)
                continue;
            std::printf("%4d  %s\n", code, text.c_str());
        }
        status = exit_status::success;
    });
}

void addMeterCommands(CLI::App& app, int& status) {
    auto cl = std::make_shared<CommandLine>();

    auto* discover = app.add_subcommand("discover", "Find the meter on a port and print its device information");
    addMeterOptions(discover, cl->meter);
    addOutputOption(discover, cl->output);
    discover->callback([cl, &status] {
        status = MeterSession(cl->meter).run([&](MeterSession& s) { emit(cl->output, xmlText(s.deviceInfo())); });
    });

    auto* read = app.add_subcommand("readings", "Upload the meter's readings and print the datalog");
    addMeterOptions(read, cl->meter);
    auto* output = addOutputOption(read, cl->output);
    auto* csv = read->add_flag("--csv", cl->csv, "Write CSV, one line per value of every entry, instead of the XML datalog");
    read->add_flag("--json", cl->json, "Write the readings as a JSON document instead of the XML datalog")->excludes(csv);
    addUnitOption(read, cl->unit);
    read->add_flag("--clear-after", cl->clearAfter,
                   "Erase the meter once the readings are safely written to the -o file")
        ->needs(output);
    read->callback([cl, &status] {
        if (cl->clearAfter && (isStandardOutput(cl->output) || !isReplaceableFile(cl->output))) {
            say("--clear-after needs -o naming a regular file, so the readings are on disk before the meter is erased");
            status = exit_status::usage;
            return;
        }
        if (cl->unit == "mmol" && !cl->csv && !cl->json) {
            say("--unit mmol converts the --csv and --json exports; the XML datalog keeps the meter's unit");
            status = exit_status::usage;
            return;
        }
        status = MeterSession(cl->meter).run([&](MeterSession& s) { readings(s, *cl); });
    });

    auto* clear = app.add_subcommand("clear", "Erase every reading stored in the meter");
    addMeterOptions(clear, cl->meter);
    clear->add_flag("--yes", cl->yes, "Really erase the meter");
    clear->callback([cl, &status] {
        if (!cl->yes) {
            say("clear erases every reading stored in the meter; run 'varnel clear --yes' to erase, "
                "or 'varnel readings -o FILE --clear-after' to save the readings first");
            status = exit_status::usage;
            return;
        }
        status = MeterSession(cl->meter).run([](MeterSession& s) {
            s.clearMeter();
            std::printf("Erased the readings of meter %s on port %s.\n",
                        printable(sectionValue(s.deviceInfo(), "DeviceInfo", "SN")).c_str(),
                        sectionValue(s.deviceInfo(), "PortInfo", "PortID").c_str());
        });
    });
}

}  // namespace varnel::cli
