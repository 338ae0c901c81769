#include "report.h"

#include <pugixml.hpp>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <sstream>

namespace varnel::cli {

namespace {

struct Band {
    const char* key;
    const char* mgdl;  // the label in mg/dL
    const char* mmol;  // in mmol/L
    const char* colour;
};

constexpr Band kBands[kBandCount] = {
    {"very-low", "below 54", "below 3.0", "#b2182b"},    {"low", "54-69", "3.0-3.8", "#ef8a62"},
    {"target", "70-180", "3.9-10.0", "#1a9850"},         {"high", "181-250", "10.1-13.9", "#fdae61"},
    {"very-high", "above 250", "above 13.9", "#d73027"},
};

std::string fixed(double value, int decimals = 1) {
    char text[64];
    std::snprintf(text, sizeof text, "%.*f", decimals, value);
    return text;
}

double inDisplay(double mgdl, GlucoseUnit unit) { return unit == GlucoseUnit::mmol ? mgdl / kMgdlPerMmol : mgdl; }

const char* unitName(GlucoseUnit unit) { return unit == GlucoseUnit::mmol ? "mmol/L" : "mg/dL"; }

// A glucose value as a number in the unit asked for: whole mg/dL or mmol/L with one decimal.
std::string number(double mgdl, GlucoseUnit unit) {
    return fixed(inDisplay(mgdl, unit), unit == GlucoseUnit::mmol ? 1 : 0);
}

// A glucose figure with its unit (figures worked out keep one decimal in either unit).
std::string glucoseText(double mgdl, GlucoseUnit unit) { return fixed(inDisplay(mgdl, unit)) + " " + unitName(unit); }

std::string bandLabel(const Band& b, GlucoseUnit unit) {
    return std::string(unit == GlucoseUnit::mmol ? b.mmol : b.mgdl) + " " + unitName(unit);
}

// "12.5" or "12" for units and grams: no trailing zero.
std::string amount(double value) {
    std::string text = fixed(value);
    if (text.size() > 2 && text.compare(text.size() - 2, 2, ".0") == 0) text.resize(text.size() - 2);
    return text;
}

constexpr const char* kHiLoNote = "HI and LO readings count at the meter's limit, the value the meter stores for them.";

}  // namespace

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

namespace {

// What is left out of the figures and why, or "" when nothing is.
std::string leftOutNote(const GlucoseSummary& s) {
    if (s.controls + s.checkStrips == 0) return {};
    return "Not counted as glucose: " + std::to_string(s.controls) + " control-solution and " +
           std::to_string(s.checkStrips) + " check-strip readings (they test the meter, not the blood).";
}

}  // namespace

std::string summaryText(const DatalogReadings& log, GlucoseUnit unit) {
    const GlucoseSummary s = summarize(log.readings);
    std::string text = "Meter " + log.model + " (serial " + log.serial + ")\n";
    if (s.count == 0) return text + "No glucose readings: there is nothing to summarise.\n";
    for (const SummaryRow& row : summaryRows(s, unit)) {
        std::string label = row.label;
        label.resize(std::max<std::size_t>(label.size() + 2, 32), ' ');
        text += label + row.value + "\n";
    }
    if (s.high + s.low > 0) text += std::string(kHiLoNote) + "\n";
    if (const std::string note = leftOutNote(s); !note.empty()) text += note + "\n";
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

Html section(Html body, const char* id, const std::string& heading) {
    Html s = body.add("section");
    s.set("id", id);
    s.add("h2", heading);
    return s;
}

Html table(Html parent, const char* cls, const std::vector<std::string>& headings) {
    Html t = parent.add("table");
    t.set("class", cls);
    Html tr = t.add("thead").add("tr");
    for (const std::string& h : headings) tr.add("th", h);
    return t.add("tbody");
}

constexpr double kWidth = 720, kHeight = 260, kLeft = 60, kRight = 70, kTop = 14, kBottom = 34;

// A plot area mapping data to the SVG, with its axes.
struct Plot {
    Html svg;
    double xMin, xMax, yMin, yMax;

    double x(double v) const { return kLeft + (v - xMin) / (xMax - xMin) * (kWidth - kLeft - kRight); }
    double y(double v) const { return kHeight - kBottom - (v - yMin) / (yMax - yMin) * (kHeight - kTop - kBottom); }
};

Html svgIn(Html parent, const std::string& id, const std::string& title, double height) {
    Html svg = parent.add("svg");
    svg.set("xmlns", "http://www.w3.org/2000/svg").set("id", id).set("class", "chart").set("role", "img");
    svg.set("viewBox", "0 0 " + fixed(kWidth, 0) + " " + fixed(height, 0));
    svg.add("title", title);
    return svg;
}

// A chart of glucose against x: the target band, the lines at 54, 70, 180 and 250 labelled in the unit,
// the axes with their data bounds (x as text, y in the unit).
Plot startPlot(Html parent, const std::string& id, const std::string& title, double xMin, double xMax, double yMax,
               const std::string& xMinText, const std::string& xMaxText, GlucoseUnit unit) {
    Html svg = svgIn(parent, id, title, kHeight);
    Plot p{svg, xMin, xMax, 0, yMax};
    svg.add("rect")
        .set("class", "target")
        .set("x", kLeft)
        .set("width", kWidth - kLeft - kRight)
        .set("y", p.y(inDisplay(kHighMgdl, unit)))
        .set("height", p.y(inDisplay(kLowMgdl, unit)) - p.y(inDisplay(kHighMgdl, unit)));
    for (double mgdl : {kVeryLowMgdl, kLowMgdl, kHighMgdl, kVeryHighMgdl}) {
        const double y = p.y(inDisplay(mgdl, unit));
        Html g = svg.add("g");
        g.set("class", "limit").set("data-value", number(mgdl, unit));
        g.add("line").set("x1", kLeft).set("x2", kWidth - kRight).set("y1", y).set("y2", y);
        // 54 and 180 under their line, 70 and 250 over it, so close lines keep their labels apart.
        const bool under = mgdl == kVeryLowMgdl || mgdl == kHighMgdl;
        g.add("text", number(mgdl, unit) + " " + unitName(unit))
            .set("x", kWidth - kRight + 4)
            .set("y", under ? y + 10 : y - 2);
    }
    Html xAxis = svg.add("g");
    xAxis.set("class", "axis x").set("data-min", xMinText).set("data-max", xMaxText);
    xAxis.add("line").set("x1", kLeft).set("x2", kWidth - kRight).set("y1", p.y(0)).set("y2", p.y(0));
    Html yAxis = svg.add("g");
    yAxis.set("class", "axis y").set("data-min", "0").set("data-max", fixed(yMax, unit == GlucoseUnit::mmol ? 1 : 0));
    yAxis.add("line").set("x1", kLeft).set("x2", kLeft).set("y1", p.y(0)).set("y2", p.y(yMax));
    yAxis.add("text", unitName(unit)).set("x", kLeft - 6).set("y", p.y(yMax) + 4).set("text-anchor", "end");
    yAxis.add("text", "0").set("x", kLeft - 6).set("y", p.y(0) + 4).set("text-anchor", "end");
    return p;
}

void xTick(const Plot& p, double x, const std::string& label) {
    Html g = p.svg.add("g");
    g.set("class", "tick").set("data-at", label);
    g.add("line").set("x1", p.x(x)).set("x2", p.x(x)).set("y1", p.y(0)).set("y2", p.y(0) + 5);
    g.add("text", label).set("x", p.x(x)).set("y", kHeight - 14).set("text-anchor", "middle");
}

void plotPoint(const Plot& p, double x, const GlucosePoint& point, GlucoseUnit unit) {
    Html dot = p.svg.add("circle");
    dot.set("class", "reading").set("cx", p.x(x)).set("cy", p.y(inDisplay(point.mgdl, unit))).set("r", "3");
    dot.set("data-time", point.time).set("data-value", inDisplay(point.mgdl, unit));
    if (!point.range.empty()) dot.set("data-range", point.range);
    dot.add("title", point.time + " " + glucoseText(point.mgdl, unit) + (point.range.empty() ? "" : " " + point.range));
}

// The key to the marks of a scatter chart, drawn under it.
void legend(Html parent, bool modal) {
    Html svg = svgIn(parent, "", "Key", 22);
    svg.node.remove_attribute("id");
    svg.set("class", "chart legend");
    double x = kLeft;
    auto item = [&](const char* cls, const char* text, bool box) {
        if (box)
            svg.add("rect").set("class", cls).set("x", x).set("y", "6").set("width", "14").set("height", "10");
        else
            svg.add("circle").set("class", cls).set("cx", x + 5).set("cy", "11").set("r", "4");
        svg.add("text", text).set("x", x + 18).set("y", "15");
        x += 36 + 6 * static_cast<double>(std::string(text).size());
    };
    item("reading", "reading", false);
    item("reading hi", "HI: above the meter's range", false);
    item("reading lo", "LO: below the meter's range", false);
    if (modal) item("iqr", "median, middle half", true);
}

// The top of the glucose axis: past the highest reading and the highest line, on a round step.
double axisTop(const std::vector<GlucosePoint>& points, GlucoseUnit unit) {
    double top = 300;
    for (const GlucosePoint& p : points) top = std::max(top, p.mgdl);
    const double step = unit == GlucoseUnit::mmol ? 2 : 50;
    return std::ceil(inDisplay(top, unit) / step) * step;
}

void overTimeChart(Html s, const std::vector<GlucosePoint>& points, const GlucoseSummary& g, GlucoseUnit unit) {
    // Whole days, so every day tick stands at a midnight.
    const long long firstDay = dayNumber(g.first), lastDay = dayNumber(g.last);
    const Plot p = startPlot(s, "glucose-over-time", "Glucose over time", static_cast<double>(firstDay),
                             static_cast<double>(lastDay + 1), axisTop(points, unit), dateOf(firstDay) + "T00:00:00",
                             dateOf(lastDay + 1) + "T00:00:00", unit);
    for (long long day : dayTicks(firstDay, lastDay)) xTick(p, static_cast<double>(day), dateOf(day).substr(5));
    for (const GlucosePoint& point : points)
        plotPoint(p, static_cast<double>(dayNumber(point.time)) + hourOfDay(point.time) / 24, point, unit);
    legend(s, false);
}

void modalDayChart(Html s, const std::vector<GlucosePoint>& points, GlucoseUnit unit) {
    const ModalDay day = modalDay(points);
    s.add("p",
          day.hourly
              ? "Median and interquartile range (the middle half of the readings) for each hour, over every reading."
              : "Too few readings for each hour: median and interquartile range (the middle half of the "
                "readings) for each time of day of the logbook, over every reading.")
        .set("class", "note");
    const Plot p = startPlot(s, "glucose-by-hour", "Every reading on one 24-hour axis", 0, 24, axisTop(points, unit),
                             "0", "24", unit);
    for (int hour = 0; hour <= 24; hour += 3) xTick(p, hour, std::to_string(hour) + ":00");
    for (const ModalBin& b : day.bins) {
        Html g = p.svg.add("g");
        g.set("class", "modal-bin")
            .set("data-from", fixed(b.fromHour, 0))
            .set("data-to", fixed(b.toHour, 0))
            .set("data-count", std::to_string(b.count))
            .set("data-median", inDisplay(b.median, unit))
            .set("data-q1", inDisplay(b.q1, unit))
            .set("data-q3", inDisplay(b.q3, unit));
        const double top = p.y(inDisplay(b.q3, unit)), bottom = p.y(inDisplay(b.q1, unit));
        g.add("rect")
            .set("class", "iqr")
            .set("x", p.x(b.fromHour))
            .set("width", p.x(b.toHour) - p.x(b.fromHour))
            .set("y", top)
            .set("height", std::max(bottom - top, 1.0));
        const double median = p.y(inDisplay(b.median, unit));
        g.add("line")
            .set("class", "median")
            .set("x1", p.x(b.fromHour))
            .set("x2", p.x(b.toHour))
            .set("y1", median)
            .set("y2", median);
    }
    for (const GlucosePoint& point : points) plotPoint(p, hourOfDay(point.time), point, unit);
    legend(s, true);
}

void bandChart(Html s, const GlucoseSummary& g, GlucoseUnit unit) {
    Html svg = svgIn(s, "bands", "Share of readings in each band", 96);
    double x = kLeft;
    const double width = kWidth - kLeft - kRight;
    for (int b = 0; b < kBandCount; ++b) {
        const double w = width * g.bandShares[b] / 100;
        svg.add("rect")
            .set("class", "band")
            .set("data-band", kBands[b].key)
            .set("data-share", g.bandShares[b])
            .set("x", x)
            .set("y", "8")
            .set("width", w)
            .set("height", "32")
            .set("fill", kBands[b].colour);
        svg.add("text", bandLabel(kBands[b], unit) + ": " + fixed(g.bandShares[b]) + " %")
            .set("x", kLeft + b * width / kBandCount)
            .set("y", b % 2 ? "76" : "60");  // staggered so long labels never overlap
        x += w;
    }
}

void slotChart(Html s, const GlucoseSummary& g, GlucoseUnit unit) {
    const double rowHeight = 24;
    Html svg =
        svgIn(s, "slots", "Mean glucose by meal slot", kTop + rowHeight * static_cast<double>(g.slots.size()) + 8);
    double top = 0;
    for (const SlotMean& m : g.slots) top = std::max(top, m.meanMgdl);
    const double left = 150, width = kWidth - left - 160;
    double y = kTop;
    for (const SlotMean& m : g.slots) {
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

// A glucose value with its HI/LO mark, as a logbook cell and the low-event list show it.
void valueIn(Html parent, const GlucosePoint& p, GlucoseUnit unit) {
    Html v = parent.add("span", number(p.mgdl, unit) + (p.range.empty() ? "" : " " + p.range));
    v.set("class", p.range == "HI" ? "value hi" : p.range == "LO" ? "value lo" : "value");
    v.set("title", p.time.substr(11, 5));
    parent.node.append_child(pugi::node_pcdata).set_value(" ");
}

template <class Map, class Text>
std::string joined(const Map& map, Text text) {
    std::string out;
    for (const auto& [name, value] : map) out += (out.empty() ? "" : ", ") + name + " " + text(value);
    return out;
}

void logbookTable(Html s, const std::vector<LogbookDay>& days, GlucoseUnit unit) {
    s.add("p", std::string("Glucose in ") + unitName(unit) +
                   "; readings without a meal slot stand in the column of their time of day "
                   "(night 0-6 h, before breakfast 6-9, after 9-11, before lunch 11-13, after 13-16, "
                   "before dinner 16-19, after 19-22, bedtime 22-24).")
        .set("class", "note");
    std::vector<std::string> headings{"Date"};
    for (const char* c : kColumnNames) headings.push_back(c);
    for (const char* h : {"Insulin (units)", "Carbs (g)", "Oral medication"}) headings.push_back(h);
    Html body = table(s, "logbook", headings);
    for (const LogbookDay& d : days) {
        Html tr = body.add("tr");
        tr.set("data-date", d.date);
        tr.add("th", d.date);
        for (const auto& cell : d.cells) {
            Html td = tr.add("td");
            for (const GlucosePoint& p : cell) valueIn(td, p, unit);
        }
        tr.add("td", joined(d.insulin, amount)).set("class", "insulin");
        tr.add("td", d.hasCarbs ? amount(d.carbs) : "").set("class", "carbs");
        tr.add("td", joined(d.oralMeds, [](int n) { return "x" + std::to_string(n); })).set("class", "oral-med");
    }
}

void lowEventsTable(Html s, const std::vector<GlucosePoint>& points, GlucoseUnit unit) {
    const std::vector<LowEvent> events = lowEvents(points);
    if (events.empty()) {
        s.add("p", "No reading below " + number(kLowMgdl, unit) + " " + unitName(unit) + ".");
        return;
    }
    int serious = 0;
    for (const LowEvent& e : events) serious += e.serious;
    s.add("p", std::to_string(events.size()) + (events.size() == 1 ? " reading below " : " readings below ") +
                   number(kLowMgdl, unit) + " " + unitName(unit) + ", " + std::to_string(serious) + " of them below " +
                   number(kVeryLowMgdl, unit) + " " + unitName(unit) + ".")
        .set("class", "note");
    Html body = table(s, "low-events", {"Date", "Time", "Glucose", "Level", "Slot"});
    for (const LowEvent& e : events) {
        Html tr = body.add("tr");
        tr.set("class", e.serious ? "serious" : "low");
        tr.add("td", e.point.time.substr(0, 10));
        tr.add("td", e.point.time.substr(11, 5));
        valueIn(tr.add("td"), e.point, unit);
        tr.add("td", e.serious ? "below " + number(kVeryLowMgdl, unit) : "below " + number(kLowMgdl, unit));
        tr.add("td", kColumnNames[e.point.column]);
    }
}

void treatmentTables(Html s, const std::vector<LogbookDay>& days) {
    const TreatmentSummary t = treatmentSummary(days);
    if (t.insulins.empty() && t.carbDays == 0 && t.oralMeds.empty()) {
        s.add("p", "The meter holds no insulin, carbohydrate or oral medication entries.");
        return;
    }
    Html body = table(s, "treatment", {"", "Total", "Days noted", "Per day noted"});
    auto row = [&](const std::string& what, double total, const char* unit, int daysNoted) {
        Html tr = body.add("tr");
        tr.add("th", what);
        tr.add("td", amount(total) + unit);
        tr.add("td", std::to_string(daysNoted));
        tr.add("td", amount(total / daysNoted));
    };
    for (const TreatmentSummary::Item& i : t.insulins) row("Insulin " + i.name, i.total, " units", i.days);
    if (t.carbDays > 0) row("Carbohydrates", t.carbs, " g", t.carbDays);
    for (const TreatmentSummary::Item& m : t.oralMeds)
        row("Oral medication " + m.name, m.total, m.total == 1 ? " dose" : " doses", m.days);
}

constexpr const char* kStyle =
    "@page{margin:12mm}"
    "body{font-family:sans-serif;font-size:10pt;margin:0 auto;max-width:186mm;color:#222}"
    "h1{font-size:15pt}h2{font-size:12pt;margin:1em 0 .3em}"
    "table{border-collapse:collapse}th,td{text-align:left;padding:2px 8px 2px 0;vertical-align:top}"
    "table.logbook{width:100%;table-layout:fixed;font-size:7.5pt}"
    "table.logbook th,table.logbook td{border-bottom:1px solid #ccc;padding:1px 2px;overflow-wrap:anywhere}"
    "table.logbook thead th{font-weight:normal;font-style:italic}"
    "table.logbook thead th:nth-child(1){width:11%}table.logbook thead th:nth-child(10){width:14%}"
    "table.logbook thead th:nth-child(11){width:6%}table.logbook thead th:nth-child(12){width:11%}"
    ".value.hi,.value.lo{font-weight:bold}.value.hi{color:#b2182b}.value.lo{color:#762a83}"
    "tr.serious td{font-weight:bold}"
    "svg.chart{width:100%;height:auto;display:block}"
    ".target{fill:#d9f0d3}.axis line,.tick line{stroke:#444}text{font-size:11px;fill:#222}"
    ".limit line{stroke:#999;stroke-dasharray:4 3}"
    "circle.reading{fill:#2166ac}circle.reading[data-range=HI],circle.hi{fill:#d73027}"
    "circle.reading[data-range=LO],circle.lo{fill:#762a83}.slot-mean{fill:#4393c3}"
    ".iqr{fill:#fdb863;fill-opacity:.45}.median{stroke:#e66101;stroke-width:2}"
    ".note{font-size:9pt;color:#444}.warning{font-weight:bold;color:#b2182b}"
    "section{break-inside:avoid}section#logbook,section#low-events{break-inside:auto}"
    "thead{display:table-header-group}tr{break-inside:avoid}";

}  // namespace

std::string reportHtml(const DatalogReadings& log, GlucoseUnit unit, const ReportContext& context) {
    // Figures come from the meter's own values; only what is shown is converted.
    const GlucoseSummary s = summarize(log.readings);
    const std::vector<GlucosePoint> points = glucosePoints(log.readings);
    const std::string title = "Glucose report: " + log.model + " " + log.serial;

    pugi::xml_document doc;
    Html html{doc.append_child("html")};
    html.set("lang", "en");
    Html head = html.add("head");
    head.add("meta").set("charset", "utf-8");
    head.add("title", title);
    head.add("style", kStyle);
    Html body = html.add("body");
    Html header = body.add("header");
    header.add("h1", title);
    header.add("p", "Report date " + context.reportDate.substr(0, 16) + ", varnel " + context.version)
        .set("class", "meta")
        .set("data-report-date", context.reportDate)
        .set("data-version", context.version);
    if (!context.clockWarning) {
        header.add("p", "The meter clock could not be read: the readings' times are as the meter stored them.")
            .set("class", "clock-offset");
    } else if (!context.clockWarning->empty()) {
        header.add("p", "At the upload " + *context.clockWarning + ".").set("class", "clock-offset warning");
    }
    if (const std::string note = leftOutNote(s); !note.empty()) header.add("p", note).set("class", "note left-out");
    if (s.count == 0) {
        body.add("p", "No glucose readings: there is nothing to summarise or chart.").set("class", "no-readings");
    } else {
        Html summary = section(body, "summary", "Summary");
        Html tbody = summary.add("table");
        tbody.set("class", "summary");
        for (const SummaryRow& row : summaryRows(s, unit)) {
            Html tr = tbody.add("tr");
            tr.set("data-key", row.key);
            tr.add("th", row.label);
            tr.add("td", row.value);
        }
        if (s.high + s.low > 0) summary.add("p", kHiLoNote).set("class", "note");
        bandChart(section(body, "ranges", "Readings in ranges"), s, unit);
        overTimeChart(section(body, "over-time", "Glucose over time"), points, s, unit);
        modalDayChart(section(body, "modal-day", "Modal day"), points, unit);
        slotChart(section(body, "slots-section", "Average by meal slot"), s, unit);
        lowEventsTable(section(body, "low-events", "Hypoglycaemia events"), points, unit);
    }
    const std::vector<LogbookDay> days = logbook(log.readings);
    treatmentTables(section(body, "treatment", "Treatment"), days);
    if (!days.empty()) logbookTable(section(body, "logbook", "Logbook"), days, unit);

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
