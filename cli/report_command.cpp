#include "report_command.h"

#include <memory>
#include <optional>
#include <string>

#include "commands.h"
#include "meter_clock.h"
#include "report.h"
#include "varnel/version.h"

namespace varnel::cli {

namespace {

struct ReportLine {
    MeterOptions meter;
    std::string output;
    std::string unit = "mgdl";
};

// What is wrong with the meter clock compared with the computer's, "" when nothing is; nothing when it
// cannot be read.
std::optional<std::string> meterClockWarning(MeterSession& s, const LocalTime& computer) {
    try {
        std::string warning = clockWarning(readMeterClock(s), computer);
        const std::string prefix = "warning: ";
        if (warning.rfind(prefix, 0) == 0) warning.erase(0, prefix.size());
        return warning;
    } catch (const RunEnd& end) {
        if (end.status >= exit_status::interrupted) throw;
        return std::nullopt;
    }
}

template <class Render>
void addSummaryCommand(CLI::App& app, int& status, const char* name, const char* help, Render render) {
    auto cl = std::make_shared<ReportLine>();
    auto* cmd = app.add_subcommand(name, help);
    addMeterOptions(cmd, cl->meter);
    addOutputOption(cmd, cl->output);
    addUnitOption(cmd, cl->unit);
    cmd->callback([cl, &status, render] {
        status =
            MeterSession(cl->meter).run([&](MeterSession& s) { emit(cl->output, render(s, glucoseUnit(cl->unit))); });
    });
}

}  // namespace

void addReportCommands(CLI::App& app, int& status) {
    addSummaryCommand(app, status, "report",
                      "Upload the readings and write a printable HTML report: summary, charts, logbook, low "
                      "glucose and treatment",
                      [](MeterSession& s, GlucoseUnit unit) {
                          const LocalTime now = computerNow();
                          const ReportContext context{now.text(), VARNEL_VERSION_STRING, meterClockWarning(s, now)};
                          return reportHtml(readDatalog(uploadDatalog(s).XML()), unit, context);
                      });
    addSummaryCommand(
        app, status, "summary", "Upload the readings and print the glucose summary as text",
        [](MeterSession& s, GlucoseUnit unit) { return summaryText(readDatalog(uploadDatalog(s).XML()), unit); });
}

}  // namespace varnel::cli
