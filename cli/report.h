// The glucose summary of a datalog as a text table, and the printable HTML report (the markup of report_figures.h).
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "report_figures.h"
#include "varnel/readings.h"

namespace varnel::cli {

// One row of the summary table: a label and its value in the unit asked for.
struct SummaryRow {
    std::string key, label, value;
};
std::vector<SummaryRow> summaryRows(const GlucoseSummary& s, GlucoseUnit unit);

// The summary as aligned text lines; says so when there is no glucose reading.
std::string summaryText(const DatalogReadings& log, GlucoseUnit unit);

// What the report says of itself and of the meter besides the readings.
struct ReportContext {
    std::string reportDate;  // "YYYY-MM-DD hh:mm:ss" of the computer
    std::string version;     // the software's version
    // What is wrong with the meter clock ("the meter clock is off (meter is 01:15:00 behind); ..."): "" when
    // nothing is, nothing when it could not be read.
    std::optional<std::string> clockWarning;
};

// One self-contained HTML page: no script, nothing loaded from elsewhere; charts as inline SVG.
std::string reportHtml(const DatalogReadings& log, GlucoseUnit unit, const ReportContext& context);

}  // namespace varnel::cli
