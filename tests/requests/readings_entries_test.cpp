#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <pugixml.hpp>
#include <sstream>

#include "requests/document_values.h"
#include "requests/readings_entries.h"
#include "varnel/component_error.h"

using namespace varnel;
using namespace varnel::detail;
using testing::HasSubstr;
using testing::Not;
using Lines = std::vector<std::string>;

namespace {

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

}  // namespace

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
