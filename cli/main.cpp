// varnel: talks to a meter of the Corvia family through the Varnel component.
#include <CLI/CLI.hpp>

#include <algorithm>
#include <exception>
#include <string>
#include <vector>

#include "caps_command.h"
#include "commands.h"
#include "report_command.h"
#include "info.h"
#include "interrupt.h"
#include "meter_clock.h"
#include "session.h"
#include "set_commands.h"
#include "settings_commands.h"
#include "validate.h"
#include "varnel/version.h"

namespace {

// Levenshtein distance: how many letters to change, add or drop to turn a into b.
std::size_t editDistance(const std::string& a, const std::string& b) {
    std::vector<std::size_t> row(b.size() + 1);
    for (std::size_t j = 0; j <= b.size(); ++j) row[j] = j;
    for (std::size_t i = 1; i <= a.size(); ++i) {
        std::size_t diagonal = row[0];
        row[0] = i;
        for (std::size_t j = 1; j <= b.size(); ++j) {
            const std::size_t above = row[j];
            row[j] = std::min({row[j] + 1, row[j - 1] + 1, diagonal + (a[i - 1] == b[j - 1] ? 0 : 1)});
            diagonal = above;
        }
    }
    return row[b.size()];
}

// What to say about a first argument that is no command: the nearest command, when one is near.
std::string unknownCommand(CLI::App& app, const std::string& given) {
    std::string nearest;
    std::size_t best = 3;  // further than two edits is no likely typo
    for (const CLI::App* sub : app.get_subcommands([](const CLI::App*) { return true; })) {
        if (sub->check_name(given)) return {};
        const std::size_t d = editDistance(given, sub->get_name());
        if (d < best) best = d, nearest = sub->get_name();
    }
    std::string text = "unknown command '" + given + "'";
    if (!nearest.empty()) text += "; did you mean '" + nearest + "'?";
    return text + " ('varnel --help' lists the commands)";
}

}  // namespace

int main(int argc, char** argv) {
    using namespace varnel::cli;
    CLI::App app{"varnel: talk to a meter of the Corvia family (simulated by default)"};
    app.footer(examplesHelp() + exitStatusHelp());
    app.set_version_flag("--version", "varnel " VARNEL_VERSION_STRING);
    app.require_subcommand(1);
    int status = exit_status::success;
    addCodesCommand(app, status);
    addInfoCommand(app, status);
    addMeterCommands(app, status);
    addCapsCommand(app, status);
    addSetCommand(app, status);
    addSettingsCommands(app, status, setMeterClock);
    addValidateCommand(app, status);
    addReportCommands(app, status);
    // Each command's --help shows its own examples, after what the command itself says.
    for (CLI::App* sub : app.get_subcommands([](const CLI::App*) { return true; })) {
        const std::string own = sub->get_footer() == app.get_footer() ? "" : sub->get_footer() + "\n\n";
        sub->footer(own + examplesHelp(sub->get_name()) + "'varnel --help' lists the exit statuses.");
    }
    // A stand-in clock that is no time would silently give way to the real one.
    app.parse_complete_callback([] {
        const std::string why = badStandInClock();
        if (why.empty()) return;
        say(why);
        throw RunEnd{exit_status::usage};
    });
    catchInterruptions();
    try {
        app.parse(argc, argv);
    } catch (const CLI::Success& e) {
        return app.exit(e);  // --help, --version
    } catch (const CLI::ParseError& e) {
        // A misspelt command otherwise reads as "A subcommand is required".
        if (argc > 1 && argv[1][0] != '-') {
            const std::string unknown = unknownCommand(app, argv[1]);
            if (!unknown.empty()) {
                say(unknown);
                return exit_status::usage;
            }
        }
        // Said as every other message is, with the command whose options explain it.
        std::string command = "varnel";
        for (const CLI::App* sub : app.get_subcommands()) command += " " + sub->get_name();
        say(std::string(e.what()) + " ('" + command + " --help' shows the options)");
        return exit_status::usage;
    } catch (const RunEnd& end) {
        return end.status;
    } catch (const std::exception& e) {
        say(e.what());
        return exit_status::local_failure;
    }
    return status;
}
