// The figures of the glucose report and summary, worked out from the readings alone (no markup here).
#pragma once

#include <array>
#include <map>
#include <string>
#include <vector>

#include "varnel/readings.h"

namespace varnel::cli {

// The glucose limits of the report, in mg/dL: bands below 54, 54-69, 70-180, 181-250, above 250.
inline constexpr double kVeryLowMgdl = 54, kLowMgdl = 70, kHighMgdl = 180, kVeryHighMgdl = 250;
inline constexpr int kBandCount = 5;

// The logbook's columns in the order of the day.
inline constexpr int kColumnCount = 8;
inline constexpr const char* kColumnNames[kColumnCount] = {
    "Before breakfast", "After breakfast", "Before lunch", "After lunch",
    "Before dinner",    "After dinner",    "Bedtime",      "Night"};

// One glucose reading as the report uses it.
struct GlucosePoint {
    double mgdl = 0;    // HI and LO count at the meter's limit, the value the meter stores for them
    std::string time;   // ISO 8601 local date-time
    std::string range;  // "HI", "LO" or ""
    std::string slot;   // the meter's meal slot, "" when none
    int column = 0;     // logbook column: the meter's slot, else the time of day
};

// The logbook column of a reading: its meal slot when the meter gave one, else the window its time falls in
// (night 0-6 h, before breakfast 6-9, after 9-11, before lunch 11-13, after 13-16, before dinner 16-19,
// after 19-22, bedtime 22-24).
int logbookColumn(const std::string& slot, const std::string& time);

// Hours since midnight of an ISO 8601 date-time.
double hourOfDay(const std::string& time);
// Days since 1970-01-01 of an ISO 8601 date (the meter's calendar; no zone).
long long dayNumber(const std::string& time);
// "YYYY-MM-DD" of a day number.
std::string dateOf(long long day);

// The glucose readings with a date and a numeric value, in mg/dL; never control solution or check strip.
std::vector<GlucosePoint> glucosePoints(const std::vector<Reading>& readings);

// Mean glucose of one meal slot.
struct SlotMean {
    std::string slot;  // "No slot" for readings the meter gave none
    int count = 0;
    double meanMgdl = 0;
};

// The figures of the summary, from the glucose readings only.
struct GlucoseSummary {
    int count = 0;        // glucose readings with a value
    int high = 0;         // of them, shown HI (counted at the meter's upper limit)
    int low = 0;          // shown LO (counted at the lower limit)
    int controls = 0;     // control-solution readings, left out of every figure
    int checkStrips = 0;  // check-strip readings, left out likewise
    std::string first;    // date-times of the first and last reading
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

// One day of the logbook.
struct LogbookDay {
    std::string date;  // YYYY-MM-DD
    std::array<std::vector<GlucosePoint>, kColumnCount> cells;
    std::map<std::string, double> insulin;  // units by insulin name
    double carbs = 0;                       // grams of carbohydrate noted that day
    bool hasCarbs = false;
    std::map<std::string, int> oralMeds;  // doses by medication name
};

// One row per calendar day with a glucose reading or a treatment entry, oldest first.
std::vector<LogbookDay> logbook(const std::vector<Reading>& readings);

// A reading below 70 mg/dL; below 54 it is a serious one.
struct LowEvent {
    GlucosePoint point;
    bool serious = false;
};
std::vector<LowEvent> lowEvents(const std::vector<GlucosePoint>& points);

// What the logbook notes of treatment, over its days.
struct TreatmentSummary {
    // One insulin or oral medication, by name.
    struct Item {
        std::string name;
        double total = 0;  // insulin units, medication doses
        int days = 0;      // days with it noted
    };
    std::vector<Item> insulins, oralMeds;
    double carbs = 0;
    int carbDays = 0;  // days with carbohydrates noted
};
TreatmentSummary treatmentSummary(const std::vector<LogbookDay>& days);

// The spread of the readings at one time of day.
struct ModalBin {
    double fromHour = 0, toHour = 0;
    int count = 0;
    double median = 0, q1 = 0, q3 = 0;  // mg/dL
};
// Median and quartiles by hour when every hour with readings holds at least three of them, else by
// the logbook's eight time-of-day windows; bins without readings are left out.
struct ModalDay {
    bool hourly = false;
    std::vector<ModalBin> bins;
};
ModalDay modalDay(const std::vector<GlucosePoint>& points);

// The q-quantile (0-1) of sorted values, interpolated between neighbours.
double quantile(const std::vector<double>& sorted, double q);

// The days to mark on a time axis from `firstDay` to `lastDay` (day numbers): every day, or every
// second, seventh, ... day so that at most `most` are marked.
std::vector<long long> dayTicks(long long firstDay, long long lastDay, int most = 12);

}  // namespace varnel::cli
