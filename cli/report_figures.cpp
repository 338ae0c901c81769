#include "report_figures.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <set>

namespace varnel::cli {

namespace {

constexpr double kBandUpper[kBandCount] = {kVeryLowMgdl, kLowMgdl, kHighMgdl + 0.5, kVeryHighMgdl + 0.5, 1e300};

// The datalog's meal slots and their logbook columns.
struct SlotColumn {
    const char* slot;
    int column;
};
constexpr SlotColumn kSlotColumns[] = {
    {"Before Breakfast", 0}, {"After Breakfast", 1}, {"Before Lunch", 2}, {"After Lunch", 3},
    {"Before Dinner", 4},    {"After Dinner", 5},    {"Night", 6},        {"Sleep", 7},
};
// The hour each column's window starts at, in column order; night runs from midnight.
constexpr double kColumnFrom[kColumnCount] = {6, 9, 11, 13, 16, 19, 22, 0};
constexpr double kColumnTo[kColumnCount] = {9, 11, 13, 16, 19, 22, 24, 6};

constexpr const char* kNoSlot = "No slot";
constexpr int kMinPerHour = 3;

// The name a treatment entry carries first (insulin, medication), or what it is.
std::string nameOf(const Reading& r, const char* otherwise) {
    return r.comments.empty() ? otherwise : r.comments.front();
}

}  // namespace

double hourOfDay(const std::string& time) {
    int h = 0, m = 0, s = 0;
    if (time.size() < 19 || std::sscanf(time.c_str() + 11, "%d:%d:%d", &h, &m, &s) != 3) return 0;
    return h + m / 60.0 + s / 3600.0;
}

long long dayNumber(const std::string& time) {
    int y = 0, mo = 0, d = 0;
    std::sscanf(time.c_str(), "%d-%d-%d", &y, &mo, &d);
    const std::chrono::sys_days day{std::chrono::year{y} / mo / d};
    return day.time_since_epoch().count();
}

std::string dateOf(long long day) {
    const std::chrono::year_month_day ymd{std::chrono::sys_days{std::chrono::days{day}}};
    char text[16];
    std::snprintf(text, sizeof text, "%04d-%02u-%02u", static_cast<int>(ymd.year()), static_cast<unsigned>(ymd.month()),
                  static_cast<unsigned>(ymd.day()));
    return text;
}

int logbookColumn(const std::string& slot, const std::string& time) {
    for (const SlotColumn& s : kSlotColumns)
        if (slot == s.slot) return s.column;
    const double hour = hourOfDay(time);
    for (int c = 0; c < kColumnCount; ++c)
        if (hour >= kColumnFrom[c] && hour < kColumnTo[c]) return c;
    return kColumnCount - 1;
}

std::vector<GlucosePoint> glucosePoints(const std::vector<Reading>& readings) {
    std::vector<GlucosePoint> points;
    for (const Reading& r : readings) {
        if (r.kind != "glucose" || r.values.empty() || r.time.empty()) continue;
        const ReadingValue& v = r.values.front();
        const auto value = numberIn(v.value);
        if (!value) continue;
        points.push_back({v.unit == "mmol/L" ? *value * kMgdlPerMmol : *value, r.time, v.range, r.slot,
                          logbookColumn(r.slot, r.time)});
    }
    return points;
}

GlucoseSummary summarize(const std::vector<Reading>& readings) {
    GlucoseSummary s;
    for (const Reading& r : readings) {
        s.controls += r.kind == "control";
        s.checkStrips += r.kind == "check_strip";
    }
    const std::vector<GlucosePoint> points = glucosePoints(readings);
    s.count = static_cast<int>(points.size());
    if (points.empty()) return s;
    double sum = 0;
    for (const GlucosePoint& p : points) {
        sum += p.mgdl;
        s.high += p.range == "HI";
        s.low += p.range == "LO";
        for (int b = 0; b < kBandCount; ++b)
            if (p.mgdl < kBandUpper[b]) {
                s.bandShares[b] += 100.0 / s.count;
                break;
            }
    }
    s.meanMgdl = sum / s.count;
    double squares = 0;
    for (const GlucosePoint& p : points) squares += (p.mgdl - s.meanMgdl) * (p.mgdl - s.meanMgdl);
    s.sdMgdl = s.count > 1 ? std::sqrt(squares / (s.count - 1)) : 0;
    s.cvPercent = s.meanMgdl > 0 ? 100 * s.sdMgdl / s.meanMgdl : 0;
    s.gmiPercent = 3.31 + 0.02392 * s.meanMgdl;

    const auto [first, last] = std::minmax_element(
        points.begin(), points.end(), [](const GlucosePoint& a, const GlucosePoint& b) { return a.time < b.time; });
    s.first = first->time;
    s.last = last->time;
    s.days = static_cast<int>(dayNumber(s.last) - dayNumber(s.first)) + 1;
    s.perDay = static_cast<double>(s.count) / s.days;

    std::vector<std::string> order;
    for (const SlotColumn& c : kSlotColumns) order.push_back(c.slot);
    order.push_back(kNoSlot);
    for (const std::string& slot : order) {
        SlotMean m{slot};
        for (const GlucosePoint& p : points) {
            if ((p.slot.empty() ? kNoSlot : p.slot) != slot) continue;
            m.meanMgdl += p.mgdl;
            ++m.count;
        }
        if (m.count == 0) continue;
        m.meanMgdl /= m.count;
        s.slots.push_back(m);
    }
    return s;
}

std::vector<LogbookDay> logbook(const std::vector<Reading>& readings) {
    std::map<std::string, LogbookDay> days;
    auto day = [&](const std::string& time) -> LogbookDay& {
        LogbookDay& d = days[time.substr(0, 10)];
        d.date = time.substr(0, 10);
        return d;
    };
    for (const GlucosePoint& p : glucosePoints(readings)) day(p.time).cells[p.column].push_back(p);
    for (const Reading& r : readings) {
        if (r.time.empty()) continue;
        for (const ReadingValue& v : r.values) {
            const auto number = numberIn(v.value);
            if (!number) continue;
            if (r.kind == "insulin" && v.quantity == "insulin")
                day(r.time).insulin[nameOf(r, "(unnamed)")] += *number;
            else if (r.kind == "pump_bolus")
                day(r.time).insulin["Pump bolus"] += *number;
            else if (r.kind == "food" && v.quantity == "Carbs") {
                LogbookDay& d = day(r.time);
                d.carbs += *number;
                d.hasCarbs = true;
            }
        }
        if (r.kind == "oral_medication") ++day(r.time).oralMeds[nameOf(r, "(unnamed)")];
    }
    std::vector<LogbookDay> rows;
    for (auto& [date, d] : days) {
        for (auto& cell : d.cells)
            std::sort(cell.begin(), cell.end(),
                      [](const GlucosePoint& a, const GlucosePoint& b) { return a.time < b.time; });
        rows.push_back(std::move(d));
    }
    return rows;
}

std::vector<LowEvent> lowEvents(const std::vector<GlucosePoint>& points) {
    std::vector<LowEvent> events;
    for (const GlucosePoint& p : points)
        if (p.mgdl < kLowMgdl) events.push_back({p, p.mgdl < kVeryLowMgdl});
    std::sort(events.begin(), events.end(),
              [](const LowEvent& a, const LowEvent& b) { return a.point.time < b.point.time; });
    return events;
}

namespace {

// The items of several days, by name, each with its total and the days it was noted on.
template <class Amount>
std::vector<TreatmentSummary::Item> byName(const std::vector<LogbookDay>& days,
                                           const std::map<std::string, Amount> LogbookDay::*member) {
    std::map<std::string, TreatmentSummary::Item> items;
    for (const LogbookDay& d : days)
        for (const auto& [name, amount] : d.*member) {
            TreatmentSummary::Item& i = items[name];
            i.name = name;
            i.total += amount;
            ++i.days;
        }
    std::vector<TreatmentSummary::Item> list;
    for (auto& [name, i] : items) list.push_back(i);
    return list;
}

}  // namespace

TreatmentSummary treatmentSummary(const std::vector<LogbookDay>& days) {
    TreatmentSummary t{byName(days, &LogbookDay::insulin), byName(days, &LogbookDay::oralMeds)};
    for (const LogbookDay& d : days) {
        if (!d.hasCarbs) continue;
        t.carbs += d.carbs;
        ++t.carbDays;
    }
    return t;
}

double quantile(const std::vector<double>& sorted, double q) {
    if (sorted.empty()) return 0;
    const double at = q * static_cast<double>(sorted.size() - 1);
    const auto below = static_cast<std::size_t>(std::floor(at));
    const std::size_t above = std::min(below + 1, sorted.size() - 1);
    return sorted[below] + (at - static_cast<double>(below)) * (sorted[above] - sorted[below]);
}

ModalDay modalDay(const std::vector<GlucosePoint>& points) {
    std::vector<std::vector<double>> hours(24);
    for (const GlucosePoint& p : points) hours[static_cast<std::size_t>(hourOfDay(p.time)) % 24].push_back(p.mgdl);
    ModalDay day;
    day.hourly = std::all_of(hours.begin(), hours.end(),
                             [](const auto& h) { return h.empty() || static_cast<int>(h.size()) >= kMinPerHour; });
    std::vector<std::pair<double, double>> spans;
    std::vector<std::vector<double>> values;
    if (day.hourly) {
        for (int h = 0; h < 24; ++h) spans.emplace_back(h, h + 1);
        values = hours;
    } else {
        // The windows in the order of the day, night first.
        values.resize(kColumnCount);
        std::vector<int> order{kColumnCount - 1};
        for (int c = 0; c < kColumnCount - 1; ++c) order.push_back(c);
        for (int c : order) spans.emplace_back(kColumnFrom[c], kColumnTo[c]);
        for (const GlucosePoint& p : points) {
            const int column = logbookColumn("", p.time);
            values[static_cast<std::size_t>(std::find(order.begin(), order.end(), column) - order.begin())].push_back(
                p.mgdl);
        }
    }
    for (std::size_t i = 0; i < values.size(); ++i) {
        std::vector<double>& v = values[i];
        if (v.empty()) continue;
        std::sort(v.begin(), v.end());
        day.bins.push_back({spans[i].first, spans[i].second, static_cast<int>(v.size()), quantile(v, 0.5),
                            quantile(v, 0.25), quantile(v, 0.75)});
    }
    return day;
}

std::vector<long long> dayTicks(long long firstDay, long long lastDay, int most) {
    const long long span = lastDay - firstDay + 1;
    long long step = 1;
    for (long long s : {1, 2, 7, 14, 28, 56, 91, 182, 364})
        if ((step = s) * most >= span) break;
    while (step * most < span) step *= 2;
    std::vector<long long> ticks;
    for (long long d = firstDay; d <= lastDay; d += step) ticks.push_back(d);
    return ticks;
}

}  // namespace varnel::cli
