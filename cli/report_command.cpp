#include "report_command.h"

#include <memory>
#include <string>

#include "commands.h"
#include "report.h"

namespace varnel::cli {

namespace {

struct ReportLine {
    MeterOptions meter;
    std::string output;
    std::string unit = "mgdl";
};

using Render = std::string (*)(const Datalog&, GlucoseUnit);

void addSummaryCommand(CLI::App& app, int& status, const char* name, const char* help, Render render) {
    auto cl = std::make_shared<ReportLine>();
    auto* cmd = app.add_subcommand(name, help);
    addMeterOptions(cmd, cl->meter);
    addOutputOption(cmd, cl->output);
    addUnitOption(cmd, cl->unit);
    cmd->callback([cl, &status, render] {
        status = MeterSession(cl->meter).run([&](MeterSession& s) {
            const XMLWrapper datalog = uploadDatalog(s);
            emit(cl->output, render(readDatalog(datalog.XML()), glucoseUnit(cl->unit)));
        });
    });
}

}  // namespace

void addReportCommands(CLI::App& app, int& status) {
    addSummaryCommand(app, status, "report",
                      "Upload the readings and write a printable HTML report with the glucose summary and charts",
                      reportHtml);
    addSummaryCommand(app, status, "summary", "Upload the readings and print the glucose summary as text", summaryText);
}

}  // namespace varnel::cli
