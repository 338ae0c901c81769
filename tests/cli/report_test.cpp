// The glucose report and summary: their figures worked out again here, their charts read back from the SVG.
#include <gtest/gtest.h>

#include <cmath>
#include <map>

#include "report.h"
#include "support/varnel_command.h"

namespace {

using namespace varnel::test;

const std::string kRecordLog = VARNEL_SOURCE_DIR "/tests/cli/record_log.xml";

std::string fixed(double v) {
    char text[32];
    std::snprintf(text, sizeof text, "%.1f", v);
    return text;
}

// "Label    value" lines of the summary text, by label.
std::map<std::string, std::string> summaryRows(const std::string& text) {
    std::map<std::string, std::string> rows;
    for (const std::string& line : lines(text)) {
        const auto gap = line.find("  ");
        if (gap == std::string::npos) continue;
        rows[line.substr(0, gap)] = line.substr(line.find_first_not_of(' ', gap));
    }
    return rows;
}

TEST_F(VarnelCommand, ReportAndSummaryShowTheFiguresOfTheGlucoseReadings) {
    // The profile's glucose readings; its control, check strip and error are not among them.
    const std::vector<double> values{159, 108, 600, 20, 70};

    double mean = 0, squares = 0;
    for (double v : values) mean += v / values.size();
    for (double v : values) squares += (v - mean) * (v - mean);
    const double sd = std::sqrt(squares / (values.size() - 1));
    const Outcome summary = varnel({"summary", "-q", "--sim-profile", kRecordLog});
    ASSERT_EQ(summary.status, 0) << summary.err;
    auto rows = summaryRows(summary.out);
    EXPECT_EQ(rows["Period"], "2005-01-11 to 2005-01-20 (10 days)");
    EXPECT_EQ(rows["Glucose readings"], "5 (1 HI, 1 LO at the meter's limit)");
    EXPECT_EQ(rows["Mean"], fixed(mean) + " mg/dL");
    EXPECT_EQ(rows["Standard deviation"], fixed(sd) + " mg/dL");
    EXPECT_EQ(rows["Coefficient of variation"], fixed(100 * sd / mean) + " %");
    EXPECT_EQ(rows["Glucose management indicator"], fixed(3.31 + 0.02392 * mean) + " %");
    // 20 | none | 70, 108, 159 | none | 600
    EXPECT_EQ(rows["Readings below 54 mg/dL"] + rows["Readings 54-69 mg/dL"] + rows["Readings 70-180 mg/dL"] +
                  rows["Readings 181-250 mg/dL"] + rows["Readings above 250 mg/dL"],
              "20.0 %0.0 %60.0 %0.0 %20.0 %");

    const fs::path file = dir / "report.html";
    const Now now("2005-02-10 20:00:00");  // the meter clock says 18:45
    const Outcome report = varnel({"report", "-q", "--sim-profile", kRecordLog, "-o", file.string()});
    ASSERT_EQ(report.status, 0) << report.err;
    const std::string html = slurp(file);
    // Nothing runs and nothing is fetched: the SVG namespace name is the only address in it.
    std::string scan = html;
    for (std::size_t at; (at = scan.find("http://www.w3.org/2000/svg")) != std::string::npos;) scan.erase(at, 26);
    for (const char* word : {"<script", "http", "src=", "href", "url("})
        EXPECT_EQ(scan.find(word), std::string::npos) << word;
    pugi::xml_document page;
    ASSERT_TRUE(page.load_string(html.c_str())) << html.substr(0, 400);
    // The same table as the summary, above the charts.
    for (const pugi::xpath_node& tr : page.select_nodes("//table[@class='summary']/tr"))
        EXPECT_EQ(tr.node().child_value("td"), rows[tr.node().child_value("th")]) << tr.node().child_value("th");
    EXPECT_EQ(page.select_nodes("//svg[@id='glucose-over-time']/circle[@class='reading']").size(), values.size());
    EXPECT_EQ(std::string(page.select_node("//p[@class='meta']").node().child_value()).substr(0, 36),
              "Report date 2005-02-10 20:00, varnel");
    EXPECT_NE(std::string(page.select_node("//p[contains(@class,'clock-offset')]").node().child_value())
                  .find("meter is 01:15:00 behind"),
              std::string::npos);
    // The time axis spans whole days, a tick on each.
    const pugi::xml_node x = page.select_node("//svg[@id='glucose-over-time']/g[@class='axis x']").node();
    EXPECT_EQ(std::string(x.attribute("data-min").value()) + " " + x.attribute("data-max").value(),
              "2005-01-11T00:00:00 2005-01-21T00:00:00");
    EXPECT_EQ(page.select_nodes("//svg[@id='glucose-over-time']/g[@class='tick']").size(), 10u);
    // What was left out said once; every section is checked in a browser (report_in_browser).
    EXPECT_EQ(std::string(page.select_node("//p[contains(@class,'left-out')]").node().child_value()),
              "Not counted as glucose: 1 control-solution and 1 check-strip readings (they test the meter, not the "
              "blood).");
    EXPECT_EQ(page.select_nodes("//table[@class='low-events']/tbody/tr[@class='serious']").size(), 1u);  // the LO 20
    EXPECT_EQ(page.select_nodes("//table[@class='low-events']/tbody/tr").size(), 1u);  // 70 is not low
    EXPECT_EQ(page.select_nodes("//table[@class='logbook']//span[contains(@class,'value')]").size(), values.size());
    std::string slots;
    for (const pugi::xpath_node& r : page.select_nodes("//svg[@id='slots']/rect[@class='slot-mean']"))
        slots += std::string(r.node().attribute("data-slot").value()) + "=" + r.node().attribute("data-mean").value() +
                 "/" + r.node().attribute("data-count").value() + " ";
    EXPECT_EQ(slots, "After Breakfast=108.0/1 No slot=" + fixed((159 + 600 + 20 + 70) / 4.0) + "/4 ");
}

TEST_F(VarnelCommand, ReportWithoutGlucoseReadingsSaysSo) {
    // The test meter without its glucose records.
    pugi::xml_document profile;
    for (const pugi::xpath_node& r : saved(profile).select_nodes("binaryDatalog/*[@type='Glucose']"))
        r.parent().remove_child(r.node());
    ASSERT_TRUE(profile.save_file(meter.c_str()));

    for (const char* command : {"summary", "report"}) {
        const Outcome r = varnel({command, "-q", "--sim-profile", meter.string()});
        EXPECT_EQ(r.status, 0) << r.err;
        EXPECT_NE(r.out.find("No glucose readings"), std::string::npos) << r.out;
        EXPECT_EQ(r.out.find("nan"), std::string::npos);
    }
}

TEST(GlucoseSummary, EachBandTakesItsBoundaryValues) {
    std::vector<varnel::Reading> readings;
    for (const char* v : {"53", "54", "69", "70", "180", "181", "250", "251"})
        readings.push_back({"", "2020-01-01T08:00:00", "glucose", {{"glucose", v, "mg/dL", ""}}, {}, "", {}});
    readings.push_back({"", "2020-01-01T09:00:00", "control", {{"control", "20", "mg/dL", ""}}, {}, "", {}});
    const auto s = varnel::cli::summarize(readings);
    EXPECT_EQ(s.count, 8);
    const std::vector<double> shares(std::begin(s.bandShares), std::end(s.bandShares));
    EXPECT_EQ(shares, (std::vector<double>{12.5, 25, 25, 25, 12.5}));
}

}  // namespace

namespace figures {

using namespace varnel::cli;

varnel::Reading entry(const char* time, const char* kind, const char* quantity, const char* value,
                      std::vector<std::string> comments = {}, const char* slot = "") {
    return {"", time, kind, {{quantity, value, kind == std::string("glucose") ? "mg/dL" : "", ""}}, {}, slot, comments};
}

TEST(ReportFigures, LogbookTreatmentAndLowsCountEachDayOnce) {
    const std::vector<varnel::Reading> readings = {
        entry("2020-01-01T07:00:00", "glucose", "glucose", "53", {}, "Sleep"),  // the meter's slot over the time
        entry("2020-01-01T07:05:00", "control", "control", "40"),               // not glucose: no cell, no low
        entry("2020-01-01T07:10:00", "insulin", "insulin", "4.5", {"Rapid"}),
        entry("2020-01-01T18:00:00", "insulin", "insulin", "6", {"Rapid"}),
        entry("2020-01-01T22:00:00", "insulin", "insulin", "12", {"LongAct"}),
        entry("2020-01-01T07:15:00", "food", "Carbs", "50"),
        entry("2020-01-01T12:15:00", "food", "Carbs", "70"),
        entry("2020-01-03T08:00:00", "oral_medication", "dose", "1", {"Metformn"}),
        entry("2020-01-03T08:30:00", "glucose", "glucose", "69"),
        entry("2020-01-03T09:30:00", "glucose", "glucose", "70"),
    };
    const auto days = logbook(readings);
    ASSERT_EQ(days.size(), 2u);  // the day without an entry has no row
    EXPECT_EQ(days[0].date, "2020-01-01");
    EXPECT_EQ(days[0].cells[7].size(), 1u);  // night
    EXPECT_EQ(days[0].insulin, (std::map<std::string, double>{{"LongAct", 12}, {"Rapid", 10.5}}));
    EXPECT_EQ(days[0].carbs, 120);
    EXPECT_EQ(days[1].cells[0].size() + days[1].cells[1].size(), 2u);  // before and after breakfast by time
    EXPECT_FALSE(days[1].hasCarbs);

    const TreatmentSummary t = treatmentSummary(days);
    ASSERT_EQ(t.insulins.size() + t.oralMeds.size(), 3u);
    EXPECT_EQ(t.insulins[1].name + " " + std::to_string(t.insulins[1].total), "Rapid 10.500000");
    EXPECT_EQ(t.oralMeds[0].name + " " + std::to_string(t.oralMeds[0].days), "Metformn 1");

    const auto lows = lowEvents(glucosePoints(readings));
    ASSERT_EQ(lows.size(), 2u);
    EXPECT_TRUE(lows[0].serious);
    EXPECT_FALSE(lows[1].serious);
}

TEST(ReportFigures, ModalDayIsHourlyOnlyWhereEveryHourHasEnoughReadings) {
    std::vector<GlucosePoint> points;
    for (double v : {100, 120, 140, 160}) points.push_back({v, "2020-01-01T08:10:00", "", "", 0});
    ModalDay day = modalDay(points);
    ASSERT_TRUE(day.hourly);
    ASSERT_EQ(day.bins.size(), 1u);
    EXPECT_EQ(day.bins[0].fromHour, 8);
    EXPECT_EQ(std::vector<double>({day.bins[0].q1, day.bins[0].median, day.bins[0].q3}),
              std::vector<double>({115, 130, 145}));
    // One reading alone at 3 h: by time-of-day window, night first.
    points.push_back({80, "2020-01-02T03:00:00", "", "", 7});
    day = modalDay(points);
    EXPECT_FALSE(day.hourly);
    ASSERT_EQ(day.bins.size(), 2u);
    EXPECT_EQ(day.bins[0].fromHour + day.bins[0].toHour + day.bins[1].fromHour, 0 + 6 + 6);
    EXPECT_EQ(day.bins[0].median, 80);
}

}  // namespace figures
