// varnel: talks to a meter of the Corvia family through the Varnel component.
#include <CLI/CLI.hpp>

#include <exception>

#include "caps_command.h"
#include "commands.h"
#include "session.h"
#include "set_commands.h"
#include "settings_commands.h"

int main(int argc, char** argv) {
    using namespace varnel::cli;
    CLI::App app{"varnel: talk to a meter of the Corvia family (simulated by default)"};
    app.footer(examplesHelp() + exitStatusHelp());
    app.require_subcommand(1);
    int status = exit_status::success;
    addCodesCommand(app, status);
    addMeterCommands(app, status);
    addCapsCommand(app, status);
    addSetCommand(app, status);
    addSettingsCommands(app, status, syncMeterClock);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        return app.exit(e) == 0 ? exit_status::success : exit_status::usage;
    } catch (const std::exception& e) {
        say(e.what());
        return exit_status::local_failure;
    }
    return status;
}
