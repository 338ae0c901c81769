// The CSV and JSON exports against the datalog they come from, on meters holding every kind of entry.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include <cstdio>
#include <map>
#include <set>

#include "exports/csv.h"
#include "support/varnel_command.h"
#include "varnel/readings.h"

namespace {

using namespace varnel::test;
using nlohmann::json;

// Type 7: every binary record kind, an out-of-range cholesterol value, measured and strip microalbumin,
// an insulin name with a comma and a quote. Type 2: HI and LO glucose, control, check strip, error.
const std::string kEveryKind = VARNEL_SOURCE_DIR "/tests/cli/every_kind.xml";
const std::string kRecordLog = VARNEL_SOURCE_DIR "/tests/cli/record_log.xml";

// RFC 4180 records: quoted fields may hold commas, doubled quotes and line breaks; lines end in CR LF.
std::vector<std::vector<std::string>> parseCsv(const std::string& text) {
    std::vector<std::vector<std::string>> rows(1, std::vector<std::string>(1));
    bool quoted = false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        const char c = text[i];
        if (quoted && c == '"' && i + 1 < text.size() && text[i + 1] == '"') {
            rows.back().back() += '"';
            ++i;
        } else if (c == '"') {
            quoted = !quoted;
        } else if (!quoted && c == ',') {
            rows.back().emplace_back();
        } else if (!quoted && c == '\r' && text.compare(i, 2, "\r\n") == 0) {
            rows.emplace_back(1);
            ++i;
        } else {
            rows.back().back() += c;
        }
    }
    rows.pop_back();  // after the last CR LF
    return rows;
}

std::string valueText(const json& v) {
    if (!v.is_number()) return v.get<std::string>();
    char text[32];
    std::snprintf(text, sizeof text, "%g", v.get<double>());
    return text;
}

// "kind: quantity=value unit range; ..." of a JSON reading and of its CSV lines, to compare them.
std::string describe(const json& r) {
    std::string text = r["kind"].get<std::string>() + ":";
    for (const json& v : r["values"])
        text += " " + v["quantity"].get<std::string>() + "=" + valueText(v["value"]) + " " + v.value("unit", "") + " " +
                v.value("range", "") + ";";
    return text;
}
std::string describe(const std::vector<std::vector<std::string>>& lines) {
    std::string text = lines.front()[1] + ":";
    for (const auto& l : lines) {
        if (l[2].empty()) continue;
        const auto number = varnel::numberIn(l[3]);
        text += " " + l[2] + "=" + (number ? valueText(*number) : l[3]) + " " + l[4] + " " + l[7] + ";";
    }
    return text;
}

std::string entryTime(const pugi::xml_node& e) {
    char text[32];
    std::snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d", e.attribute("Y").as_int(),
                  e.attribute("MM").as_int(), e.attribute("D").as_int(), e.attribute("h").as_int(),
                  e.attribute("m").as_int(), e.attribute("s").as_int());
    return text;
}

TEST_F(VarnelCommand, CsvAndJsonHoldEveryEntryOfTheDatalogValueForValue) {
    // What the profiles hold, written out by hand: one row per kind whose values are easy to lose.
    const std::map<std::string, std::string> expected = {
        {"2008-02-15T07:10:09", "insulin: insulin=14.5 Units ;"},
        {"2008-02-15T07:15:09", "food: Carbs=50  ; SFat=12  ; Cals=480  ; Protein=20  ;"},
        {"2008-02-15T12:00:00", "control: control=126 mg/dL ;"},
        {"2008-02-17T09:05:09", "ketones: ketones=Trace  ;"},
        {"2008-02-17T10:16:09", "microalbumin: microalbumin=>1000  ;"},
        {"2008-02-17T10:18:09", "microalbumin: microalbumin=28  ;"},
        {"2008-02-17T11:05:09", "cholesterol: LDL=520 mg/dL HI; HDL=52 mg/dL ; Total=196 mg/dL ; Trig=141 mg/dL ;"},
        {"2008-02-17T12:35:09", "blood_pressure: systolic=134  ; diastolic=78  ;"},
        {"2008-02-17T13:07:09", "weight_height: Wt=182.4  ; Ht=69.5  ;"},
        {"2008-02-18T16:05:09", "calibration_change: from=4  ; to=11  ;"},
        {"2005-01-12T12:29:23", "glucose: glucose=600 mg/dL HI;"},
        {"2005-01-13T12:09:19", "glucose: glucose=20 mg/dL LO;"},
        {"2005-01-14T07:30:00", "check_strip: check_strip=114 mg/dL ;"},
        {"2005-01-15T00:28:03", "error: error=5  ;"},
    };
    std::size_t checked = 0;
    for (const std::string& profile : {kEveryKind, kRecordLog}) {
        SCOPED_TRACE(profile);
        const std::vector<std::string> meter{"readings", "-q", "--sim-profile", profile};
        auto run = [&](std::vector<std::string> more) {
            more.insert(more.begin(), meter.begin(), meter.end());
            const Outcome r = varnel(more);
            EXPECT_EQ(r.status, 0) << r.err;
            return r.out;
        };
        pugi::xml_document xml;
        ASSERT_TRUE(xml.load_string(run({}).c_str()));
        const json doc = json::parse(run({"--json"}));
        const std::string csvText = run({"--csv"});
        const auto csv = parseCsv(csvText);
        ASSERT_FALSE(csv.empty());
        EXPECT_EQ(csv[0], (std::vector<std::string>{"date-time", "kind", "quantity", "value", "unit", "slot",
                                                    "comments", "range", "ord", "serial", "model"}));
        // What merging several meters and uploads needs: the meter on every line, each entry's own number.
        const pugi::xml_node device = xml.child("Datalog").child("DeviceInfo");
        EXPECT_EQ(doc["meter"]["serial"], device.child_value("SN"));
        std::set<std::string> ords;

        std::size_t line = 1, i = 0;
        for (const pugi::xml_node& entry : xml.child("Datalog").child("Records").children()) {
            ASSERT_LT(i, doc["readings"].size());
            const json& r = doc["readings"][i++];
            EXPECT_EQ(r["time"], entryTime(entry));
            const std::string ord = entry.attribute("Ord").value();
            EXPECT_EQ(r["ord"], ord.empty() ? json() : json(std::stoll(ord)));
            EXPECT_TRUE(ord.empty() || ords.insert(ord).second) << "Ord " << ord << " twice";
            // Its CSV lines: one per value, at least one.
            std::vector<std::vector<std::string>> lines;
            for (std::size_t n = 0; n < std::max<std::size_t>(1, r["values"].size()); ++n) {
                ASSERT_LT(line, csv.size());
                lines.push_back(csv[line++]);
                EXPECT_EQ(lines.back()[0], r["time"]);
                EXPECT_EQ(lines.back()[5], r.value("slot", ""));
                EXPECT_EQ(std::vector<std::string>(lines.back().begin() + 8, lines.back().end()),
                          (std::vector<std::string>{ord, device.child_value("SN"), device.child_value("Name")}));
            }
            EXPECT_EQ(describe(lines), describe(r)) << entryTime(entry);
            if (const auto row = expected.find(r["time"]); row != expected.end()) {
                EXPECT_EQ(describe(r), row->second);
                ++checked;
            }
        }
        EXPECT_EQ(i, doc["readings"].size());
        EXPECT_EQ(ords.empty(), profile != kEveryKind);  // only the binary-datalog meter numbers its entries
        EXPECT_EQ(line, csv.size());
        // RFC 4180: the insulin name with a comma and a quote, quoted with the quote doubled.
        if (profile == kEveryKind) {
            EXPECT_NE(csvText.find("2008-02-15T07:10:09,insulin,insulin,14.5,Units,,\"Mix, \"\"B\"\"\",,"),
                      std::string::npos);
        }
    }
    EXPECT_EQ(checked, expected.size());
}

TEST_F(VarnelCommand, CsvInMmolConvertsGlucoseOnlyAndSaysSoInTheHeader) {
    const auto mgdl = parseCsv(varnel({"readings", "-q", "--csv", "--sim-profile", kRecordLog}).out);
    const auto mmol = parseCsv(varnel({"readings", "-q", "--csv", "--sim-profile", kRecordLog, "--unit", "mmol"}).out);
    ASSERT_EQ(mmol.size(), mgdl.size());
    EXPECT_NE(mmol[0][3].find("mmol/L"), std::string::npos) << mmol[0][3];
    int converted = 0;
    for (std::size_t i = 1; i < mgdl.size(); ++i) {
        auto want = mgdl[i];
        if (want[4] == "mg/dL") {
            char text[16];
            std::snprintf(text, sizeof text, "%.1f", std::stod(want[3]) / 18.0182);
            want[3] = text;
            want[4] = "mmol/L";
            ++converted;
        }
        if (want[1] == "check_strip") want[6] = mmol[i][6];  // its range, checked below
        EXPECT_EQ(mmol[i], want);
    }
    EXPECT_EQ(converted, 7);  // five glucose readings, a control and a check strip
    // A check strip's range (90-140 mg/dL) converts with its value, and says its unit.
    EXPECT_EQ(mmol[7][1] + " " + mmol[7][6], "check_strip Strip range 5.0-7.8 mmol/L");
    EXPECT_EQ(mmol[4][3] + " " + mmol[4][7], "33.3 HI");

    // The XML datalog keeps the meter's unit: asking to convert it is refused before the meter is touched.
    EXPECT_EQ(varnel({"readings", "-q", "--unit", "mmol", "--sim-profile", kRecordLog}).status, 64);
}

// A CSV field a spreadsheet would split is quoted and a formula disarmed; JSON numbers are plain decimals only.
TEST(ExportFields, QuotedAndDisarmedForSpreadsheetsAndOnlyPlainDecimalsAreNumbers) {
    using varnel::detail::csvField;
    EXPECT_EQ(csvField("two\r\nlines"), "\"two\r\nlines\"");
    EXPECT_EQ(csvField("=HYPERLINK(\"x\")"), "\"'=HYPERLINK(\"\"x\"\")\"");
    EXPECT_EQ(csvField("@cmd"), "'@cmd");
    EXPECT_EQ(csvField("-2.5"), "-2.5");
    EXPECT_EQ(csvField("-0x10"), "'-0x10");
    for (const char* text : {"12", "-2.5", "0", "9223372036854775807", "-9223372036854775808"})
        EXPECT_TRUE(varnel::numberIn(text)) << text;
    // JSON would write these as numbers a reader takes differently, or cannot hold.
    for (const char* text : {"0x1A", "-0x1", " 12", "\t5", "12 ", "1e3", "+5", "1.", ".5", "-", "9223372036854775808",
                             "-9223372036854775809", "inf", "nan", ""})
        EXPECT_FALSE(varnel::numberIn(text)) << text;
}

}  // namespace
