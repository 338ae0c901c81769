#include "report.h"

#include <pugixml.hpp>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstdio>
#include <sstream>

namespace varnel::cli {

namespace {

constexpr double kMgdlPerMmol = 18.0182;
constexpr double kTargetLow = 70, kTargetHigh = 180;

struct Band {
    const char* key;
    const char* label;  // in mg/dL
    const char* colour;
    double upper;  // a reading below this (and not below the previous band's) is in the band
};

constexpr Band kBands[kBandCount] = {
    {"very-low", "below 54", "#b2182b", 54},      {"low", "54-69", "#ef8a62", 70},
    {"target", "70-180", "#1a9850", 180.5},       {"high", "181-250", "#fdae61", 250.5},
    {"very-high", "above 250", "#d73027", 1e300},
};

// The slots in the order of the day, as the datalog names them.
constexpr const char* kSlotOrder[] = {"Before Breakfast", "After Breakfast", "Before Lunch", "After Lunch",
                                      "Before Dinner",    "After Dinner",    "Night",        "Sleep"};
constexpr const char* kNoSlot = "No slot";

struct Point {
    double mgdl;
    std::string time;
    std::string range;
    std::string slot;
};

// Seconds since 1970 of an ISO 8601 local date-time, on the meter's own calendar (no zone).
long long secondsOf(const std::string& iso) {
    int y = 0, mo = 0, d = 0, h = 0, mi = 0, s = 0;
    std::sscanf(iso.c_str(), "%d-%d-%dT%d:%d:%d", &y, &mo, &d, &h, &mi, &s);
    const std::chrono::sys_days day{std::chrono::year{y} / mo / d};
    return static_cast<long long>(day.time_since_epoch().count()) * 86400 + h * 3600 + mi * 60 + s;
}

std::vector<Point> glucosePoints(const std::vector<Reading>& readings) {
    std::vector<Point> points;
    for (const Reading& r : readings) {
        if (r.kind != "glucose" || r.values.empty() || r.time.empty()) continue;
        const ReadingValue& v = r.values.front();
        const auto value = numberIn(v.value);
        if (!value) continue;
        points.push_back(
            {v.unit == "mmol/L" ? *value * kMgdlPerMmol : *value, r.time, v.range, r.slot.empty() ? kNoSlot : r.slot});
    }
    return points;
}

std::string fixed(double value, int decimals = 1) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*f", decimals, value);
    return text;
}

// A glucose figure in the unit asked for: whole mg/dL or mmol/L with one decimal.
std::string glucoseText(double mgdl, GlucoseUnit unit) {
    return unit == GlucoseUnit::mmol ? fixed(mgdl / kMgdlPerMmol) + " mmol/L" : fixed(mgdl) + " mg/dL";
}

double inDisplay(double mgdl, GlucoseUnit unit) { return unit == GlucoseUnit::mmol ? mgdl / kMgdlPerMmol : mgdl; }

std::string bandLabel(const Band& b, GlucoseUnit unit) {
    if (unit == GlucoseUnit::meter) return std::string(b.label) + " mg/dL";
    static const char* mmol[kBandCount] = {"below 3.0", "3.0-3.8", "3.9-10.0", "10.1-13.9", "above 13.9"};
    return mmol[&b - kBands] + std::string(" mmol/L");
}

constexpr const char* kHiLoNote = "HI and LO readings count at the meter's limit, the value the meter stores for them.";

}  // namespace

GlucoseSummary summarize(const std::vector<Reading>& readings) {
    GlucoseSummary s;
    const std::vector<Point> points = glucosePoints(readings);
    s.count = static_cast<int>(points.size());
    if (points.empty()) return s;
    double sum = 0;
    for (const Point& p : points) {
        sum += p.mgdl;
        s.high += p.range == "HI";
        s.low += p.range == "LO";
        for (int b = 0; b < kBandCount; ++b)
            if (p.mgdl < kBands[b].upper) {
                s.bandShares[b] += 100.0 / s.count;
                break;
            }
    }
    s.meanMgdl = sum / s.count;
    double squares = 0;
    for (const Point& p : points) squares += (p.mgdl - s.meanMgdl) * (p.mgdl - s.meanMgdl);
    s.sdMgdl = s.count > 1 ? std::sqrt(squares / (s.count - 1)) : 0;
    s.cvPercent = s.meanMgdl > 0 ? 100 * s.sdMgdl / s.meanMgdl : 0;
    s.gmiPercent = 3.31 + 0.02392 * s.meanMgdl;

    const auto [first, last] = std::minmax_element(points.begin(), points.end(),
                                                   [](const Point& a, const Point& b) { return a.time < b.time; });
    s.first = first->time;
    s.last = last->time;
    s.days = static_cast<int>(secondsOf(s.last.substr(0, 10) + "T00:00:00") / 86400 -
                              secondsOf(s.first.substr(0, 10) + "T00:00:00") / 86400) +
             1;
    s.perDay = static_cast<double>(s.count) / s.days;

    std::vector<std::string> order(std::begin(kSlotOrder), std::end(kSlotOrder));
    order.push_back(kNoSlot);
    for (const std::string& slot : order) {
        SlotMean m{slot};
        for (const Point& p : points) {
            if (p.slot != slot) continue;
            m.meanMgdl += p.mgdl;
            ++m.count;
        }
        if (m.count == 0) continue;
        m.meanMgdl /= m.count;
        s.slots.push_back(m);
    }
    return s;
}

std::vector<SummaryRow> summaryRows(const GlucoseSummary& s, GlucoseUnit unit) {
    std::string readings = std::to_string(s.count);
    if (s.high + s.low > 0)
        readings += " (" + std::to_string(s.high) + " HI, " + std::to_string(s.low) + " LO at the meter's limit)";
    std::vector<SummaryRow> rows = {
        {"period", "Period",
         s.first.substr(0, 10) + " to " + s.last.substr(0, 10) + " (" + std::to_string(s.days) +
             (s.days == 1 ? " day)" : " days)")},
        {"readings", "Glucose readings", readings},
        {"mean", "Mean", glucoseText(s.meanMgdl, unit)},
        {"sd", "Standard deviation", glucoseText(s.sdMgdl, unit)},
        {"cv", "Coefficient of variation", fixed(s.cvPercent) + " %"},
        {"gmi", "Glucose management indicator", fixed(s.gmiPercent) + " %"},
        {"per-day", "Readings per day", fixed(s.perDay)},
    };
    for (int b = 0; b < kBandCount; ++b)
        rows.push_back({std::string("band-") + kBands[b].key, "Readings " + bandLabel(kBands[b], unit),
                        fixed(s.bandShares[b]) + " %"});
    return rows;
}

std::string summaryText(const Datalog& log, GlucoseUnit unit) {
    const GlucoseSummary s = summarize(log.readings);
    std::string text = "Meter " + log.model + " (serial " + log.serial + ")\n";
    if (s.count == 0) return text + "No glucose readings: there is nothing to summarise.\n";
    for (const SummaryRow& row : summaryRows(s, unit)) {
        std::string label = row.label;
        label.resize(std::max<std::size_t>(label.size() + 2, 32), ' ');
        text += label + row.value + "\n";
    }
    if (s.high + s.low > 0) text += std::string(kHiLoNote) + "\n";
    return text;
}

namespace {

// Builds the page's elements; pugixml escapes every text and attribute.
struct Html {
    mutable pugi::xml_node node;

    Html add(const char* name, const std::string& text = "") const {
        pugi::xml_node child = node.append_child(name);
        if (!text.empty()) child.text().set(text.c_str());
        return {child};
    }
    const Html& set(const char* name, const std::string& value) const {
        node.append_attribute(name).set_value(value.c_str());
        return *this;
    }
    const Html& set(const char* name, double value) const { return set(name, fixed(value)); }
};

constexpr double kWidth = 720, kHeight = 260, kLeft = 56, kRight = 16, kTop = 14, kBottom = 34;

// A plot area mapping data to the SVG: x and y ranges with their axes drawn and labelled.
struct Plot {
    Html svg;
    double xMin, xMax, yMin, yMax;

    double x(double v) const { return kLeft + (v - xMin) / (xMax - xMin) * (kWidth - kLeft - kRight); }
    double y(double v) const { return kHeight - kBottom - (v - yMin) / (yMax - yMin) * (kHeight - kTop - kBottom); }
};

Plot startPlot(Html parent, const std::string& id, const std::string& title, double xMin, double xMax, double yMax,
               const std::string& xMinText, const std::string& xMaxText, GlucoseUnit unit) {
    Html svg = parent.add("svg");
    svg.set("xmlns", "http://www.w3.org/2000/svg").set("id", id).set("class", "chart").set("role", "img");
    svg.set("viewBox", "0 0 " + fixed(kWidth, 0) + " " + fixed(kHeight, 0));
    svg.add("title", title);
    Plot p{svg, xMin, xMax, 0, yMax};
    // The target band under everything else.
    svg.add("rect")
        .set("class", "target")
        .set("x", kLeft)
        .set("width", kWidth - kLeft - kRight)
        .set("y", p.y(inDisplay(kTargetHigh, unit)))
        .set("height", p.y(inDisplay(kTargetLow, unit)) - p.y(inDisplay(kTargetHigh, unit)));
    Html xAxis = svg.add("g");
    xAxis.set("class", "axis x").set("data-min", xMinText).set("data-max", xMaxText);
    xAxis.add("line").set("x1", kLeft).set("x2", kWidth - kRight).set("y1", p.y(0)).set("y2", p.y(0));
    // Labels read as a person writes a date-time; the data attributes keep ISO 8601.
    auto label = [](std::string text) {
        std::replace(text.begin(), text.end(), 'T', ' ');
        return text;
    };
    xAxis.add("text", label(xMinText)).set("x", kLeft).set("y", kHeight - 12);
    xAxis.add("text", label(xMaxText)).set("x", kWidth - kRight).set("y", kHeight - 12).set("text-anchor", "end");
    Html yAxis = svg.add("g");
    yAxis.set("class", "axis y").set("data-min", "0").set("data-max", fixed(yMax, unit == GlucoseUnit::mmol ? 1 : 0));
    yAxis.add("line").set("x1", kLeft).set("x2", kLeft).set("y1", p.y(0)).set("y2", p.y(yMax));
    for (double mgdl : {kTargetLow, kTargetHigh}) {
        const double v = inDisplay(mgdl, unit);
        yAxis.add("text", fixed(v, unit == GlucoseUnit::mmol ? 1 : 0))
            .set("x", kLeft - 6)
            .set("y", p.y(v) + 4)
            .set("text-anchor", "end");
    }
    yAxis.add("text", fixed(yMax, unit == GlucoseUnit::mmol ? 1 : 0))
        .set("x", kLeft - 6)
        .set("y", p.y(yMax) + 4)
        .set("text-anchor", "end");
    return p;
}

void plotPoint(const Plot& p, double x, const Point& point, GlucoseUnit unit) {
    Html dot = p.svg.add("circle");
    dot.set("class", "reading").set("cx", p.x(x)).set("cy", p.y(inDisplay(point.mgdl, unit))).set("r", "3");
    dot.set("data-time", point.time).set("data-value", inDisplay(point.mgdl, unit));
    if (!point.range.empty()) dot.set("data-range", point.range);
    dot.add("title", point.time + " " + glucoseText(point.mgdl, unit) + (point.range.empty() ? "" : " " + point.range));
}

// The top of the glucose axis: past the highest reading and the band above target, on a round step.
double axisTop(const std::vector<Point>& points, GlucoseUnit unit) {
    double top = 300;
    for (const Point& p : points) top = std::max(top, p.mgdl);
    const double step = unit == GlucoseUnit::mmol ? 2 : 50;
    return std::ceil(inDisplay(top, unit) / step) * step;
}

void overTimeChart(Html parent, const std::vector<Point>& points, const GlucoseSummary& s, GlucoseUnit unit) {
    double from = static_cast<double>(secondsOf(s.first)), to = static_cast<double>(secondsOf(s.last));
    if (to <= from) from -= 43200, to += 43200;  // a single moment still gets a day's width
    parent.add("h2", "Glucose over time");
    const Plot p = startPlot(parent, "glucose-over-time", "Glucose over time", from, to, axisTop(points, unit), s.first,
                             s.last, unit);
    for (const Point& point : points) plotPoint(p, static_cast<double>(secondsOf(point.time)), point, unit);
}

void dayChart(Html parent, const std::vector<Point>& points, GlucoseUnit unit) {
    parent.add("h2", "Readings by time of day");
    const Plot p = startPlot(parent, "glucose-by-hour", "Every reading on one 24-hour axis", 0, 24,
                             axisTop(points, unit), "0", "24", unit);
    for (int hour = 6; hour < 24; hour += 6)
        p.svg.add("text", std::to_string(hour) + ":00")
            .set("x", p.x(hour))
            .set("y", kHeight - 12)
            .set("text-anchor", "middle");
    for (const Point& point : points) {
        const long long sec = secondsOf(point.time) % 86400;
        plotPoint(p, static_cast<double>(sec) / 3600.0, point, unit);
    }
}

void bandChart(Html parent, const GlucoseSummary& s, GlucoseUnit unit) {
    parent.add("h2", "Time in ranges");
    Html svg = parent.add("svg");
    svg.set("xmlns", "http://www.w3.org/2000/svg").set("id", "bands").set("class", "chart").set("role", "img");
    svg.set("viewBox", "0 0 " + fixed(kWidth, 0) + " 96");
    svg.add("title", "Share of readings in each band");
    double x = kLeft;
    const double width = kWidth - kLeft - kRight;
    for (int b = 0; b < kBandCount; ++b) {
        const double w = width * s.bandShares[b] / 100;
        svg.add("rect")
            .set("class", "band")
            .set("data-band", kBands[b].key)
            .set("data-share", s.bandShares[b])
            .set("x", x)
            .set("y", "8")
            .set("width", w)
            .set("height", "32")
            .set("fill", kBands[b].colour);
        svg.add("text", bandLabel(kBands[b], unit) + ": " + fixed(s.bandShares[b]) + " %")
            .set("x", kLeft + b * width / kBandCount)
            .set("y", b % 2 ? "76" : "60");  // staggered so long labels never overlap
        x += w;
    }
}

void slotChart(Html parent, const GlucoseSummary& s, GlucoseUnit unit) {
    parent.add("h2", "Average by meal slot");
    const double rowHeight = 24;
    const double height = kTop + rowHeight * static_cast<double>(s.slots.size()) + 8;
    Html svg = parent.add("svg");
    svg.set("xmlns", "http://www.w3.org/2000/svg").set("id", "slots").set("class", "chart").set("role", "img");
    svg.set("viewBox", "0 0 " + fixed(kWidth, 0) + " " + fixed(height, 0));
    svg.add("title", "Mean glucose by meal slot");
    double top = 0;
    for (const SlotMean& m : s.slots) top = std::max(top, m.meanMgdl);
    const double left = 150, width = kWidth - left - 140;
    double y = kTop;
    for (const SlotMean& m : s.slots) {
        svg.add("text", m.slot).set("x", "4").set("y", y + 14);
        svg.add("rect")
            .set("class", "slot-mean")
            .set("data-slot", m.slot)
            .set("data-mean", inDisplay(m.meanMgdl, unit))
            .set("data-count", std::to_string(m.count))
            .set("x", left)
            .set("y", y + 2)
            .set("width", top > 0 ? width * m.meanMgdl / top : 0)
            .set("height", rowHeight - 6);
        svg.add("text", glucoseText(m.meanMgdl, unit) + " (" + std::to_string(m.count) + ")")
            .set("x", left + width + 8)
            .set("y", y + 14);
        y += rowHeight;
    }
}

constexpr const char* kStyle =
    "body{font-family:sans-serif;margin:2em;color:#222}"
    "table{border-collapse:collapse}th,td{text-align:left;padding:2px 12px 2px 0}"
    "svg.chart{width:100%;max-width:720px;height:auto;display:block}"
    ".target{fill:#d9f0d3}.axis line{stroke:#444}text{font-size:11px;fill:#222}"
    "circle.reading{fill:#2166ac}circle.reading[data-range]{fill:#d73027}.slot-mean{fill:#4393c3}"
    "section{page-break-inside:avoid;break-inside:avoid}"
    "@media print{body{margin:0}}";

}  // namespace

std::string reportHtml(const Datalog& log, GlucoseUnit unit) {
    // Figures come from the meter's own values; only what is shown is converted.
    const GlucoseSummary s = summarize(log.readings);
    const std::vector<Point> points = glucosePoints(log.readings);
    const std::string title = "Glucose report: " + log.model + " " + log.serial;

    pugi::xml_document doc;
    Html html{doc.append_child("html")};
    html.set("lang", "en");
    Html head = html.add("head");
    head.add("meta").set("charset", "utf-8");
    head.add("title", title);
    head.add("style", kStyle);
    Html body = html.add("body");
    body.add("h1", title);
    if (s.count == 0) {
        body.add("p", "No glucose readings: there is nothing to summarise or chart.").set("class", "no-readings");
    } else {
        Html table = body.add("table");
        table.set("class", "summary");
        for (const SummaryRow& row : summaryRows(s, unit)) {
            Html tr = table.add("tr");
            tr.set("data-key", row.key);
            tr.add("th", row.label);
            tr.add("td", row.value);
        }
        if (s.high + s.low > 0) body.add("p", kHiLoNote).set("class", "note");
        overTimeChart(body.add("section"), points, s, unit);
        dayChart(body.add("section"), points, unit);
        bandChart(body.add("section"), s, unit);
        slotChart(body.add("section"), s, unit);
    }
    std::ostringstream out;
    out << "<!DOCTYPE html>\n";
    // Void HTML elements (meta) close themselves; every other element gets its end tag.
    doc.save(out, "  ", pugi::format_indent | pugi::format_no_declaration | pugi::format_no_empty_element_tags);
    std::string text = out.str();
    const std::string meta = "<meta charset=\"utf-8\"></meta>";
    if (const auto at = text.find(meta); at != std::string::npos)
        text.replace(at, meta.size(), "<meta charset=\"utf-8\" />");
    return text;
}

}  // namespace varnel::cli
