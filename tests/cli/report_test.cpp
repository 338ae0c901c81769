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
    const std::vector<std::string> meter{"-q", "--sim-profile", kRecordLog};
    auto args = [&](std::vector<std::string> a) {
        a.insert(a.end(), meter.begin(), meter.end());
        return a;
    };
    // The profile's glucose readings; its control, check strip and error are not among them.
    const std::vector<double> values{159, 108, 600, 20, 70};
    const std::string first = "2005-01-11T18:26:28", last = "2005-01-20T07:10:00";

    double mean = 0, squares = 0;
    for (double v : values) mean += v / values.size();
    for (double v : values) squares += (v - mean) * (v - mean);
    const double sd = std::sqrt(squares / (values.size() - 1));
    const Outcome summary = varnel(args({"summary"}));
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
    const Outcome report = varnel(args({"report", "-o", file.string()}));
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
    const pugi::xml_node x = page.select_node("//svg[@id='glucose-over-time']/g[@class='axis x']").node();
    EXPECT_EQ(std::string(x.attribute("data-min").value()) + " " + x.attribute("data-max").value(), first + " " + last);
    std::string slots;
    for (const pugi::xpath_node& r : page.select_nodes("//svg[@id='slots']/rect[@class='slot-mean']"))
        slots += std::string(r.node().attribute("data-slot").value()) + "=" + r.node().attribute("data-mean").value() +
                 "/" + r.node().attribute("data-count").value() + " ";
    EXPECT_EQ(slots, "After Breakfast=108.0/1 No slot=" + fixed((159 + 600 + 20 + 70) / 4.0) + "/4 ");
}

TEST_F(VarnelCommand, ReportWithoutGlucoseReadingsSaysSo) {
    // The test meter without its glucose records.
    pugi::xml_document profile;
    pugi::xml_node log = saved(profile).child("binaryDatalog");
    for (pugi::xml_node r = log.first_child(); r;) {
        const pugi::xml_node next = r.next_sibling();
        if (std::string(r.attribute("type").value()) == "Glucose") log.remove_child(r);
        r = next;
    }
    ASSERT_TRUE(profile.save_file(meter.c_str()));

    for (const char* command : {"summary", "report"}) {
        const Outcome r = varnel({command, "-q", "--sim-profile", meter.string()});
        EXPECT_EQ(r.status, 0) << r.err;
        EXPECT_NE(r.out.find("No glucose readings"), std::string::npos) << r.out;
        EXPECT_EQ(r.out.find("nan"), std::string::npos);
    }
}

TEST(GlucoseSummary, EachBandTakesItsBoundaryValues) {
    std::vector<varnel::cli::Reading> readings;
    for (const char* v : {"53", "54", "69", "70", "180", "181", "250", "251"})
        readings.push_back({"2020-01-01T08:00:00", "glucose", {{"glucose", v, "mg/dL", ""}}, "", {}});
    readings.push_back({"2020-01-01T09:00:00", "control", {{"control", "20", "mg/dL", ""}}, "", {}});
    const auto s = varnel::cli::summarize(readings);
    EXPECT_EQ(s.count, 8);
    const std::vector<double> shares(std::begin(s.bandShares), std::end(s.bandShares));
    EXPECT_EQ(shares, (std::vector<double>{12.5, 25, 25, 25, 12.5}));
}

}  // namespace
