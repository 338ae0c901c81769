// The datalog the readings request writes, and how each result becomes an entry.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <pugixml.hpp>
#include <sstream>

#include "requests/document_values.h"
#include "requests/readings_entries.h"
#include "support/wrapper_fixture.h"
#include "varnel/component_error.h"

using namespace varnel;
using namespace varnel::test;
using namespace varnel::detail;
using testing::HasSubstr;
using testing::Not;
using Lines = std::vector<std::string>;

namespace {

struct Readings : WrapperTest {
    XMLWrapper datalog = newDoc(doc_kind::datalog);
    XMLWrapper filter = newDoc(doc_kind::filter);
    std::shared_ptr<pugi::xml_document> tree;  // the datalog the last read wrote
    bool checked = false;

    // Reads into the datalog, keeps it parsed and gives the next read an empty one.
    std::int32_t read() {
        const std::int32_t r = wrapper->getReadings(rec, device, datalog, filter, status, checked);
        tree = parsed(datalog);
        datalog = newDoc(doc_kind::datalog);
        return r;
    }
    // The transfer summary: the counts, then each unit as name=Txt.
    std::vector<std::string> summary() const {
        std::vector<std::string> out;
        pugi::xml_node detail = tree->document_element().child("TransferDetail");
        for (pugi::xml_node n : detail.child("Records").children()) out.push_back(n.child_value());
        for (pugi::xml_node n : detail.child("ExtraInfo").children())
            out.push_back(std::string(n.name()) + "=" + n.attribute("Txt").value());
        return out;
    }
    std::vector<pugi::xml_node> entries(const char* name = "") const {
        std::vector<pugi::xml_node> out;
        for (pugi::xml_node n : tree->document_element().child("Records").children())
            if (!*name || std::string(n.name()) == name) out.push_back(n);
        return out;
    }
    // Kind, value (an error's is its Txt), range, ordinal and date of an entry, against the meter's record.
    static std::string entry(pugi::xml_node n) {
        std::string out = std::string(n.name()) + " " + n.attribute("Val").value() + n.child_value("Txt");
        for (const char* a : {"Range", "Ord", "Y", "MM", "D", "h", "m", "s"})
            out += " " + std::string(n.attribute(a).value());
        return out;
    }
    static std::string expected(const char* kind, int value, const char* range, int ord, std::int32_t seconds) {
        TIME_REC t{};
        sim::fromSeconds(seconds, t);
        const std::string o = ord < 0 ? "" : std::to_string(ord);
        char text[96];
        std::snprintf(text, sizeof text, "%s %d %s %s %d %02d %d %d %d %d", kind, value, range, o.c_str(), t.year,
                      t.mon, t.mday, t.hour, t.min, t.sec);
        return text;
    }
};

TEST_F(Readings, RecordDatalogAsTheMeterHoldsIt) {
    discover(eDunmark);
    filter.AddElement("Anything", "is never read");
    expectExit(read(), ME_SUCCESS, "", false);
    EXPECT_TRUE(checked);

    const sim::MeterProfile meter = sim::meter();
    std::vector<data_rec> valid;
    std::copy_if(meter.datalog.begin(), meter.datalog.end(), std::back_inserter(valid),
                 [](const data_rec& e) { return e.Valid == 0; });
    const auto n = meter.datalog.size(), corrupted = n - valid.size();
    ASSERT_GT(corrupted, 0u);
    EXPECT_EQ(summary(),
              (std::vector<std::string>{std::to_string(n), std::to_string(valid.size()), std::to_string(corrupted),
                                        "255", "GlucCalib=Whole Blood", "GlucUnit=mg/dL"}));
    EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("SN"), meter.serial);
    // One entry per valid record, in order: meter errors as Error, every other test as Gluc; a HI or LO
    // reading says so, a measured one carries no range.
    const auto written = entries();
    ASSERT_EQ(written.size(), valid.size());
    for (std::size_t i = 0; i < valid.size(); ++i) {
        const std::int16_t f = valid[i].Test.Flags;
        EXPECT_EQ(entry(written[i]), expected(f == 3 ? "Error" : "Gluc", valid[i].Test.Result,
                                              f == 1   ? "High"
                                              : f == 2 ? "Low"
                                                       : "",
                                              -1, valid[i].D_Time));
    }
    EXPECT_TRUE(std::any_of(valid.begin(), valid.end(), [](const data_rec& e) { return e.Test.Flags == 1; }));
    EXPECT_TRUE(std::any_of(valid.begin(), valid.end(), [](const data_rec& e) { return e.Test.Flags == 2; }));
}

TEST_F(Readings, BinaryDatalogWithOrdinalsAndEveryUnit) {
    discover(eMorvex);
    ASSERT_EQ(read(), ME_SUCCESS);
    const sim::MeterProfile meter = sim::meter();
    const std::string n = std::to_string(meter.binaryDatalog.size());
    EXPECT_EQ(summary(), (std::vector<std::string>{n, n, "0", "1000", "GlucCalib=Plasma", "GlucUnit=mg/dL",
                                                   "OMedUnit=Each", "InsUnit=Units", "CholesUnit=mg/dL"}));
    std::vector<RECORD_DATA> glucose;
    std::copy_if(meter.binaryDatalog.begin(), meter.binaryDatalog.end(), std::back_inserter(glucose),
                 [](const RECORD_DATA& r) { return r.recType == 0; });
    const auto gluc = entries("Gluc");
    ASSERT_EQ(gluc.size(), glucose.size());
    for (std::size_t i = 0; i < glucose.size(); i += 5)
        EXPECT_EQ(entry(gluc[i]), expected("Gluc", glucose[i].reading, "", glucose[i].Ordinal, glucose[i].timeStamp));

    // Records damaged in the meter are counted once, apart from the valid ones.
    sim::MeterProfile damaged = meter;
    damaged.corruptedRecords = {3, 50, 100};
    discover(damaged);
    ASSERT_EQ(read(), ME_SUCCESS);
    std::vector<std::string> counts = summary();
    counts.resize(3);
    EXPECT_EQ(counts, (std::vector<std::string>{n, std::to_string(meter.binaryDatalog.size() - 3), "3"}));
}

// The device information and transport failures: the device information tests and the fault sweep.
TEST_F(Readings, ADatalogWithoutDeviceInfoIsAnUnexpectedError) {
    discover(eDunmark);
    // A datalog without DeviceInfo: the unexpected-error handler.
    fresh();
    datalog = newDoc(doc_kind::filter);
    EXPECT_EQ(unexpectedTrace([&] { read(); }), "91 getReadings --> ");
    expectUnexpected("Unknown status;Error number = 91 Error description = ");
}

// A record that cannot be read or dated is lost alone: every other entry is written with
// its own date, the counts add up, and the request fails saying how many records were lost.
TEST_F(Readings, UnreadableRecordsAreCountedAndReportedWithEveryOtherEntryKept) {
    // A binary datalog of plain glucose tests: one entry per record, in record order.
    sim::MeterProfile binary = sim::defaultProfile(eMorvex);
    binary.binaryDatalog.clear();
    for (std::int16_t i = 0; i < 8; ++i) {
        RECORD_DATA& r = binary.binaryDatalog.emplace_back();
        r.timeStamp = sim::secondsOf(2004, 3, 1 + i, 8, 30, i), r.Ordinal = i, r.reading = 100 + i;
    }
    struct Case {
        int type;
        const char* function;
        int record;       // the record whose read fails, 0-based among the records that are read
        int tries;        // failing calls from that record's first one: 1 is retried, 2 loses it
        bool persistent;  // every later call fails too: every record from there on is lost
    };
    // A failure that is retried once loses nothing: the fault sweep. Here, records lost for good.
    for (const Case& c : {Case{eDunmark, "convert_from_seconds", 5, 2, false},
                          {eDunmark, "convert_from_seconds", 30, 1, true},
                          {eMorvex, "GetMeterDatalogRecordData", 4, 2, false},
                          {eMorvex, "GetMeterDatalogRecordData", 2, 1, true},
                          {eMorvex, "convert_from_seconds", 3, 1, true}}) {
        SCOPED_TRACE(std::to_string(c.type) + " " + c.function + " " + std::to_string(c.record));
        c.type == eMorvex ? discover(binary) : discover(c.type);
        const auto texts = [this] {
            std::vector<std::string> out;
            for (pugi::xml_node n : entries()) out.push_back(nodeText(n));
            return out;
        };
        ASSERT_EQ(read(), ME_SUCCESS);
        std::vector<std::string> counts = summary(), kept = texts();
        const int lost = c.persistent ? std::stoi(counts[1]) - c.record : 1;
        kept.erase(kept.begin() + c.record, kept.begin() + c.record + lost);
        counts[1] = std::to_string(std::stoi(counts[1]) - lost);
        counts[2] = std::to_string(std::stoi(counts[2]) + lost);

        fresh();
        // A failing call and its retry are the record's two calls.
        for (int i = 0; i < c.tries; ++i) sim::injectFault(c.function, c.record + 1, ME_TIME_OUT, c.persistent);
        expectExit(read(), ME_TIME_OUT,
                   "-17/-2/Timeout error ; " + std::to_string(lost) + " of " + counts[0] + " records could not be read",
                   false);
        sim::clearFaults();
        EXPECT_EQ(texts(), kept);
        EXPECT_EQ(summary(), counts);
    }
}

// How each kind of result becomes an entry of the datalog.
const std::string kDate = R"( D="5" MM="03" Y="2024" h="7" m="8" s="9")";

// A datalog document as the request leaves it before the entries, and the results to write.
struct Datalog {
    XMLWrapper doc;
    ResultCollection results;
    EntryContext context{.checkStripLow = 80, .checkStripHigh = 120};
    UniqueChecker checker;

    explicit Datalog(std::int16_t meterType, bool withExtraInfo = true) {
        context.storedMeterType = context.lastMeterType = meterType;
        doc.InitDocument(doc_kind::datalog);
        doc.SelectElement("TransferDetail");
        doc.AddElement("Records");
        if (withExtraInfo) doc.AddElement("ExtraInfo");
        doc.SelectElement("Records");
    }

    template <class T>
    T& add(std::int32_t type, double value = 0, std::int32_t group = 0) {
        auto r = std::make_shared<T>();
        r->setDateTime(*DateTime::fromParts(2024, 3, 5, 7, 8, 9));
        r->setOrdinal(static_cast<std::int16_t>(results.Count() + 1));
        r->setGroupId(group);
        if constexpr (T::shape.fixedType == kSettableType) r->setResultType(type);
        if constexpr (T::shape.value == ValueType::Long) r->setValue(static_cast<std::int32_t>(value));
        if constexpr (T::shape.value == ValueType::Double) r->setValue(value);
        results.Add(r);
        return *r;
    }

    Glucose& glucose(std::initializer_list<std::int32_t> codes, std::int32_t slot = 0) {
        Glucose& g = add<Glucose>(10, 100);
        for (auto c : codes) g.Comments()->Add(c, 1);
        g.setSlot(slot);
        return g;
    }

    // The children of the element at path, each as one line of XML with the test date shown as " @".
    Lines at(const char* path) const {
        pugi::xml_document parsed;
        parsed.load_string(doc.XML().c_str());
        Lines out;
        for (pugi::xml_node n : parsed.first_element_by_path(path).children()) {
            std::ostringstream s;
            n.print(s, "", pugi::format_raw);
            std::string text = s.str();
            if (auto p = text.find(kDate); p != std::string::npos) text.replace(p, kDate.size(), " @");
            out.push_back(text);
        }
        return out;
    }

    Lines write() {
        writeReadingsEntries(doc, results, context, checker);
        EXPECT_EQ(checker.Count(), 0u);
        return at("/Datalog/Records");
    }
};

TEST(ReadingsEntries, MergesValuesOfOneMeterEntry) {
    Datalog d(4);
    d.add<BloodPressure>(90, 120, 1);
    d.add<BloodPressure>(91, 80, 2);  // BP merges whatever the group
    d.add<BloodPressure>(90, 130, 3);
    d.add<BloodPressure>(90, 125, 3);  // a second systolic is a new reading
    d.add<BodyDimensions>(100, 70.5, 4);
    d.add<BodyDimensions>(101, 180, 5);
    d.add<BodyDimensions>(101, 175, 6);
    d.add<BodyDimensions>(100, 72, 6);
    d.add<HealthNotes>(170, 1, 7);
    d.add<HealthNotes>(172, 1, 7);
    d.add<Food>(50, 45, 8).setMealSlot(3);
    d.add<Food>(52, 10, 8);
    d.add<Food>(57, 5, 8);  // a snack value does not join a meal
    d.add<Food>(55, 12, 9);
    d.add<Food>(55, 30, 9);
    EXPECT_EQ(d.write(), (Lines{R"(<BP Health="true" @ Syst="120" Diast="80"/>)", R"(<BP Health="true" @ Syst="130"/>)",
                                R"(<BP Health="true" @ Syst="125"/>)", R"(<HtWt Health="true" @><Wt>70.5</Wt></HtWt>)",
                                R"(<HtWt Health="true" @><Ht>180</Ht></HtWt>)",
                                R"(<HtWt Health="true" @><Ht>175</Ht><Wt>72</Wt></HtWt>)",
                                R"(<HNotes Health="true" @><Stress/><Ill/></HNotes>)",
                                R"(<Food @><Slot Txt="Lunch">2</Slot><Carbs>45</Carbs><SFat>10</SFat></Food>)",
                                R"(<Food @><Slot Txt="Snack">4</Slot><SFat>5</SFat></Food>)",
                                R"(<Food @><Slot Txt="Snack">4</Slot><Carbs>12</Carbs></Food>)",
                                R"(<Food @><Slot Txt="Snack">4</Slot><Carbs>30</Carbs></Food>)"}));
}

TEST(ReadingsEntries, CholesterolUnitWrittenOnceAndEarlierEntriesSurviveErrors) {
    Datalog d(3);
    d.add<Cholestrol>(130, 100, 1).setUnitType(1);
    d.add<Cholestrol>(131, 2.5, 1);
    d.add<Cholestrol>(150, 1.5, 1);
    d.add<Cholestrol>(130, 3, 2);
    EXPECT_EQ(d.write(), (Lines{R"(<Choles Health="true" @><LDL>100</LDL><HDL>2.5</HDL><Trig>1.5</Trig></Choles>)",
                                R"(<Choles Health="true" @><LDL>3</LDL></Choles>)"}));
    EXPECT_EQ(d.at("/Datalog/TransferDetail/ExtraInfo"), (Lines{R"(<CholesUnit Txt="mmol/L">1</CholesUnit>)"}));

    Datalog written(7);
    written.context.cholesUnitWritten = true;
    written.add<Cholestrol>(140, 180);
    EXPECT_EQ(written.write().size(), 1u);
    EXPECT_TRUE(written.at("/Datalog/TransferDetail/ExtraInfo").empty());

    Datalog broken(3, /*withExtraInfo=*/false);
    broken.add<hbA1C>(0, 7);
    broken.add<Cholestrol>(140, 180);
    EXPECT_THROW(broken.write(), ComponentError);
    EXPECT_EQ(broken.at("/Datalog/Records"), (Lines{R"(<HbA1c Health="true" @ Val="7"/>)"}));
}

// A HI or LO result carries the meter's limit as its value; Range says so, and only then.
TEST(ReadingsEntries, ResultsOutsideTheMetersRangeAreMarked) {
    Datalog d(7);
    for (std::int32_t range : {1, 2, 3}) d.add<Glucose>(10, 600).setValueInMeterRange(range);
    d.add<CheckStrip>(0, 20).setValueInMeterRange(2);
    d.add<Cholestrol>(130, 501, 1).setValueInMeterRange(1);
    d.add<Cholestrol>(131, 40, 1).setValueInMeterRange(3);
    d.context.cholesUnitWritten = true;
    const Lines lines = d.write();
    ASSERT_EQ(lines.size(), 5u);
    EXPECT_EQ(lines[0], R"(<Gluc @ Val="600" Range="High" Type="0" Txt="Blood" Site="0" Ord="1"/>)");
    EXPECT_THAT(lines[1], HasSubstr(R"(Range="Low")"));
    EXPECT_THAT(lines[2], Not(HasSubstr("Range")));
    EXPECT_THAT(lines[3], HasSubstr(R"(Val="20" Range="Low" Type="2")"));
    EXPECT_EQ(lines[4], R"(<Choles Health="true" @ Ord="5"><LDL Range="High">501</LDL><HDL>40</HDL></Choles>)");
}

TEST(ReadingsEntries, GlucoseCommentsAndSlotsByMeterType) {
    const std::string plain = R"(<Gluc @ Val="100" Type="0" Txt="Blood" Site="0">)";
    Datalog two(2);
    two.glucose({5});
    two.glucose({13});
    two.glucose({0, 3, 9, 1});  // the later slot code wins, code 1 stays a comment
    Lines lines = two.write();
    EXPECT_EQ(lines[0], plain + R"(<MealSlot Slot="4" Txt="After Lunch"/></Gluc>)");
    EXPECT_EQ(lines[1], plain + R"(<Comments><Ill/></Comments></Gluc>)");
    EXPECT_EQ(lines[2], plain + R"(<MealSlot Slot="7" Txt="Sleep"/>)"
                                R"(<Comments><Food Txt="Fasting">1</Food></Comments></Gluc>)");

    Datalog seven(7);
    seven.glucose({1, 14, 99}).events()->Add(5, 1);
    EXPECT_THAT(seven.write()[0], HasSubstr(R"(<Comments><Food Txt="Fasting">1</Food><Hypo/>)"
                                            R"(<Event Txt="EVENT5">5</Event></Comments>)"));

    // Other meters keep their comments as they come; a leading code 0 hides nothing.
    Datalog four(4);
    four.glucose({11}, 7);
    EXPECT_EQ(four.write()[0], plain + R"(<MealSlot Slot="7" Txt="Night"/>)"
                                       R"(<Comments><Ex Txt="Before">0</Ex></Comments></Gluc>)");
    for (std::int16_t type : {6, 8}) {
        Datalog quiet(type);
        quiet.glucose({13}).events()->Add(4, 1);
        EXPECT_THAT(quiet.write()[0], Not(HasSubstr("Comments"))) << type;
    }
}

// Numbers and dates as every document writes them.
TEST(DocumentValues, RealNumbersAndDatesBeforeDayZero) {
    std::string numbers;
    for (double v : {123.0, -5.0, 0.5, -0.0, 123456789012345.0, 1e15, 1.0 / 3}) numbers += NumberText(v) + " ";
    EXPECT_EQ(numbers, "123 -5 0.5 0 123456789012345 1000000000000000 0.333333333333333 ");

    // Before day 0 (30 December 1899) the day still starts at midnight; without the time, the date alone.
    for (bool withTime : {true, false}) {
        std::string text;
        for (const auto& [name, value] : dateAttributes(*DateTime::fromParts(1899, 1, 9, 18, 4, 0), withTime))
            text += std::string(name) + "=" + value + " ";
        EXPECT_EQ(text, withTime ? "D=9 MM=01 Y=1899 h=18 m=4 s=0 " : "D=9 MM=01 Y=1899 ");
    }
}

}  // namespace
