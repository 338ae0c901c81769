#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "settings/clock_group.h"
#include "settings/general_group.h"
#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "support/fake_transport.h"
#include "support/sim_session.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

using Groups = test::SimSession;

DateTime at(int y, int mo, int d, int h = 0, int mi = 0, int s = 0) { return *DateTime::fromParts(y, mo, d, h, mi, s); }

template <class G>
G initialised(clsMeterFns& fns) {
    G group;
    group.initialise(fns);
    return group;
}

}  // namespace

TEST_F(Groups, ClockSavesReadsAndWindowsTheYear) {
    connect(eMorvex);
    auto clock = initialised<Group_Clock>(*fns);
    clock.setClockTime(at(2005, 3, 7, 14, 5, 9));
    ASSERT_EQ(clock.saveToMeter(), 0);
    EXPECT_EQ(sim::meter().clock, sim::secondsOf(2005, 3, 7, 14, 5, 9));
    clock.ClockInSeconds = 0;
    ASSERT_EQ(clock.readFromMeter(), 0);
    EXPECT_EQ(clock.ClockTime(), at(2005, 3, 7, 14, 5, 9));
    EXPECT_EQ(clock.getTimeForSec(sim::secondsOf(2029, 12, 31, 23, 59, 59)), at(2029, 12, 31, 23, 59, 59));
    EXPECT_EQ(clock.getTimeForSec(sim::secondsOf(2031, 6, 1, 8)), at(1931, 6, 1, 8));

    sim::injectFault("vb_Read_Meter_Clock", 1, ME_TIME_OUT, false);
    clock.ClockInSeconds = 1;
    EXPECT_EQ(clock.readFromMeter(), ME_TIME_OUT);
    EXPECT_EQ(clock.ClockInSeconds, 1);
}

TEST_F(Groups, GeneralOptionsComeFromTheMeterAndValuesAreRoundedHalfToEven) {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    p.options[eStripCalCode] = {2, 5, 0, 50};
    p.options[eLanguage] = {};
    connect(p);
    auto general = initialised<Group_General>(*fns);
    ASSERT_EQ(general.readFromMeter(), 0);
    EXPECT_EQ(general.OptionByKey(eLanguage), nullptr);
    int offered = 0;
    for (const sim::OptionEntry& o : p.options) offered += o.availability != 0;
    ASSERT_EQ(general.Count(), offered);
    auto code = general.OptionByIndex(1);
    EXPECT_EQ(code, general.OptionByKey(eStripCalCode));
    EXPECT_EQ(std::get<std::int32_t>(code->Value()), 5);
    EXPECT_TRUE(code->isModified);

    // Everything just read is written back unchanged.
    ASSERT_EQ(general.saveToMeter(), 0);
    EXPECT_EQ(sim::meter().options, p.options);
    for (auto [text, sent] : {std::pair{"12.5", 12}, {" 13.5 ", 14}, {"abc", 0}}) {
        code->setValue(std::string(text));
        ASSERT_EQ(general.saveToMeter(), 0) << text;
        EXPECT_EQ(sim::meter().options[eStripCalCode].value, sent) << text;
    }

    sim::injectFault("vb_Read_Meter_Options", 1, ME_COM_ERROR, false);
    EXPECT_EQ(general.readFromMeter(), ME_COM_ERROR);
    EXPECT_EQ(general.Count(), offered);
    EXPECT_EQ(general.OptionByKey(eStripCalCode), code);
}

TEST(GeneralGroup, AvailabilityCodesSentFollowTheOptions) {
    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    fake->does("vb_Read_Meter_Options", [](test::FakeArgs& a) {
        SETTINGS_REC& s = a.rec->Setting;
        s = SETTINGS_REC{};
        s.Availability[1] = 1, s.nValue[1] = 4;
        s.Availability[2] = 2, s.nValue[2] = 1;
        s.Availability[5] = 2, s.nValue[5] = 0;
        s.Availability[20] = 2;  // beyond the nineteen options
    });
    SETTINGS_REC sent{};
    fake->does("vb_Set_Meter_Options", [&](test::FakeArgs& a) { sent = a.ref<SETTINGS_REC>(); });
    auto general = initialised<Group_General>(fns);
    ASSERT_EQ(general.readFromMeter(), 0);
    ASSERT_EQ(general.Count(), 3);
    general.OptionByKey(2)->isModified = false;
    general.OptionByKey(5)->setValue(-2.5);
    ASSERT_EQ(general.saveToMeter(), 0);
    std::vector<int> codes(sent.Availability, sent.Availability + 22), values(sent.nValue, sent.nValue + 22);
    std::vector<int> wantCodes(22, 0), wantValues(22, 0);
    wantCodes[1] = 1, wantCodes[5] = 2, wantValues[5] = -2;
    EXPECT_EQ(codes, wantCodes);
    EXPECT_EQ(values, wantValues);
}

TEST_F(Groups, MedicationNamesRoundTripAndOnlyCustomChangesAreSent) {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    p.insulinNames[12].bytes = "ABCDEFGHIJ";  // no zero byte in the field
    connect(p);
    auto insulins = initialised<Group_Insulins>(*fns);
    auto oralMeds = initialised<Group_OralMeds>(*fns);
    ASSERT_EQ(insulins.readFromMeter(), 0);
    ASSERT_EQ(oralMeds.readFromMeter(), 0);
    EXPECT_EQ(insulins.InsulinName(13), "ABCDEFGHI");
    EXPECT_EQ(oralMeds.OralMedName(6), p.oralMedNames[5].bytes);

    insulins.setInsulinName(12, "Twelve chars");
    insulins.setInsulinName(5, "Never");
    insulins.setFavInsulin(3, 12);
    oralMeds.setOralMedName(5, "Fixed");
    oralMeds.setOralMedName(15, "Last");
    ASSERT_EQ(insulins.saveToMeter(), 0);
    ASSERT_EQ(oralMeds.saveToMeter(), 0);
    const sim::MeterProfile m = sim::meter();
    EXPECT_EQ(m.insulinNames[11].bytes, "Twelve c");
    EXPECT_EQ(m.insulinNames[4], p.insulinNames[4]);
    EXPECT_EQ(m.favoriteInsulins, (std::array<std::int16_t, 3>{8, 2, 12}));
    EXPECT_EQ(m.oralMedNames[4], p.oralMedNames[4]);
    EXPECT_EQ(m.oralMedNames[14].bytes, "Last");
    EXPECT_EQ(sim::callCount("SetInsulinName"), 1);
    EXPECT_TRUE(insulins.InsulinNameChanged(12));  // a save leaves the flags
}

TEST_F(Groups, MedicationReadDecidedByTheLastNameAndStopsOnTheContinueFlag) {
    connect(eMorvex);
    auto insulins = initialised<Group_Insulins>(*fns);
    ASSERT_EQ(insulins.readFromMeter(), 0);
    const std::string fifth = insulins.InsulinName(5);
    ASSERT_FALSE(fifth.empty());

    // A failure before the last position still counts as read; the name it missed is kept.
    sim::clearFaults();
    sim::injectFault("GetInsulinName", 5, ME_CHKSUM_ERROR, false);
    EXPECT_EQ(insulins.readFromMeter(), 0);
    EXPECT_EQ(insulins.InsulinName(5), fifth);
    EXPECT_EQ(insulins.InsulinName(4), sim::meter().insulinNames[3].bytes);

    // A failure at the last position fails the read before the favourites.
    const int favouriteCalls = sim::callCount("GetPredefinedInsulins");
    sim::injectFault("GetInsulinName", 21, ME_CHKSUM_ERROR, false);
    EXPECT_EQ(insulins.readFromMeter(), ME_CHKSUM_ERROR);
    EXPECT_EQ(sim::callCount("GetPredefinedInsulins"), favouriteCalls);

    const int nameCalls = sim::callCount("GetInsulinName");
    insulins.setInsulinName(14, "Mine");
    SetContinueFlag(false);
    EXPECT_EQ(insulins.readFromMeter(), 0);
    EXPECT_EQ(sim::callCount("GetInsulinName"), nameCalls);
    EXPECT_TRUE(insulins.InsulinNameChanged(14));
}

TEST(TableGroups, PositionsOutsideTheTablesReadEmptyAndFailToWrite) {
    Group_Insulins insulins;
    Group_OralMeds oralMeds;
    Group_Schedule schedule;
    EXPECT_EQ(insulins.InsulinName(22), "");
    EXPECT_FALSE(oralMeds.OralMedNameChanged(16));
    EXPECT_EQ(insulins.FavInsulin(4), 0);
    EXPECT_EQ(schedule.ScheduleTime(8), DateTime::fromSerial(-36522));
    for (auto [call, className, trace] :
         {std::tuple<std::function<void()>, const char*, const char*>{
              [&] { insulins.setInsulinName(22, "x"); }, "Group_Insulins", "InsulinName --> "},
          {[&] { insulins.setFavInsulin(4, 1); }, "Group_Insulins", "FavInsulin --> "},
          {[&] { oralMeds.isOralMedChangeable(16); }, "Group_OralMeds", "isOralMedChangeable --> "},
          {[&] { schedule.setScheduleTime(8, DateTime()); }, "Group_Schedule", "ScheduleTime --> "}}) {
        EXPECT_EQ(test::unexpectedTrace(call), std::to_string(errc::subscript_out_of_range) + " " + trace);
        EXPECT_EQ(errPropagator().ClassName, className);
    }
}

TEST(ScheduleGroup, KeepsQuarterHoursAndSendsZeroForUnchangedSegmentsAndOnlyTheSelectionForTypeZero) {
    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    MEAL_SEGMENTS_TYPE sent{};
    fake->does("SetMealSegments", [&](test::FakeArgs& a) { sent = a.ref<MEAL_SEGMENTS_TYPE>(); });
    auto schedule = initialised<Group_Schedule>(fns);
    schedule.setScheduleTime(3, at(2001, 5, 5, 7, 44, 59));
    EXPECT_EQ(schedule.ScheduleTime(3), DateTime::fromSeconds(7 * 3600 + 30 * 60));
    EXPECT_FALSE(schedule.ScheduleTimeChanged(2));
    ASSERT_EQ(schedule.saveToMeter(), 0);
    EXPECT_EQ(fake->names(), (std::vector<std::string>{"SetScheduleSelection"}));

    schedule.ScheduleType = 1;
    ASSERT_EQ(schedule.saveToMeter(), 0);
    EXPECT_EQ(fake->calls()[1].values, (std::vector<std::int32_t>{1}));
    EXPECT_EQ(std::vector<int>(sent.mealSegments, sent.mealSegments + 7), (std::vector<int>{0, 0, 30, 0, 0, 0, 0}));
}
