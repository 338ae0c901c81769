// The glucose summary of a datalog: its figures, as a text table and as a printable HTML report.
#pragma once

#include <string>
#include <vector>

#include "export.h"

namespace varnel::cli {

// The glucose bands of the summary, in mg/dL: <54, 54-69, 70-180, 181-250, >250.
inline constexpr int kBandCount = 5;

// Mean glucose of one meal slot.
struct SlotMean {
    std::string slot;  // "No slot" for readings the meter gave none
    int count = 0;
    double meanMgdl = 0;
};

// The figures of the summary, worked out from the glucose readings only (not control solution or check strip).
struct GlucoseSummary {
    int count = 0;      // glucose readings with a value
    int high = 0;       // of them, shown HI (counted at the meter's upper limit)
    int low = 0;        // shown LO (counted at the lower limit)
    std::string first;  // date-times of the first and last reading
    std::string last;
    int days = 0;  // calendar days from the first reading's to the last one's, both counted
    double meanMgdl = 0;
    double sdMgdl = 0;  // sample standard deviation (n - 1); 0 for one reading
    double cvPercent = 0;
    double gmiPercent = 0;  // 3.31 + 0.02392 x mean mg/dL
    double perDay = 0;
    double bandShares[kBandCount] = {};  // percent of the readings in each band
    std::vector<SlotMean> slots;         // slots with readings, in the order of the day
};

GlucoseSummary summarize(const std::vector<Reading>& readings);

// One row of the summary table: a label and its value in the unit asked for.
struct SummaryRow {
    std::string key, label, value;
};
std::vector<SummaryRow> summaryRows(const GlucoseSummary& s, GlucoseUnit unit);

// The summary as aligned text lines; says so when there is no glucose reading.
std::string summaryText(const Datalog& log, GlucoseUnit unit);
// One self-contained HTML page: no script, nothing loaded from elsewhere; charts as inline SVG.
std::string reportHtml(const Datalog& log, GlucoseUnit unit);

}  // namespace varnel::cli
