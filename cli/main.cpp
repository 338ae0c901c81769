// varnel: talks to a meter of the Corvia family through the Varnel component.
#include <CLI/CLI.hpp>

#include <exception>
#include <string>

#include "caps_command.h"
#include "commands.h"
#include "report_command.h"
#include "session.h"
#include "set_commands.h"
#include "settings_commands.h"
#include "validate.h"
#include "varnel/version.h"

namespace {

bool isCommand(CLI::App& app, const std::string& name) {
    for (const CLI::App* sub : app.get_subcommands([](const CLI::App*) { return true; }))
        if (sub->check_name(name)) return true;
    return false;
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
    addMeterCommands(app, status);
    addCapsCommand(app, status);
    addSetCommand(app, status);
    addSettingsCommands(app, status, syncMeterClock);
    addValidateCommand(app, status);
    addReportCommands(app, status);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        // A misspelt command otherwise reads as "A subcommand is required".
        if (argc > 1 && argv[1][0] != '-' && !isCommand(app, argv[1])) {
            say(std::string("unknown command '") + argv[1] + "' (varnel --help lists the commands)");
            return exit_status::usage;
        }
        return app.exit(e) == 0 ? exit_status::success : exit_status::usage;
    } catch (const std::exception& e) {
        say(e.what());
        return exit_status::local_failure;
    }
    return status;
}
