#include <gtest/gtest.h>

#include <map>

#include "errors/err_propagator.h"
#include "settings/clock_group.h"
#include "settings/general_group.h"
#include "settings/medication_groups.h"
#include "settings/meter_settings.h"
#include "settings/schedule_group.h"
#include "settings/setup_option.h"
#include "settings/targets_group.h"
#include "support/fake_transport.h"
#include "support/sim_session.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::detail;
using test::FakeArgs;

namespace {

using Groups = test::SimSession;

DateTime at(int y, int mo, int d, int h = 0, int mi = 0, int s = 0) { return *DateTime::fromParts(y, mo, d, h, mi, s); }

// The number and trace of the error a call raised, and the class its handler named.
template <class F>
std::string failure(F&& call) {
    return test::unexpectedTrace(call) + " in " + errPropagator().ClassName;
}

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

    // A conversion that keeps failing is reported, never a made-up date (one failure is retried: the
    // settings request's test).
    clock.ClockInSeconds = sim::secondsOf(2005, 3, 7, 14, 5, 9);
    DateTime read = at(2005, 3, 7, 14, 5, 9);
    sim::injectFault("convert_from_seconds", 1, ME_TIME_OUT, true);
    EXPECT_EQ(clock.readClockTime(read), ME_TIME_OUT);
    EXPECT_EQ(read, at(2005, 3, 7, 14, 5, 9));
    EXPECT_THROW(clock.ClockTime(), ComponentError);
    sim::clearFaults();
}

TEST(GeneralGroup, OptionsComeFromTheMeterAndWritesFollowTheirCodes) {
    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    fake->does("vb_Read_Meter_Options", [](FakeArgs& a) {
        SETTINGS_REC& s = a.rec->Setting;
        s = SETTINGS_REC{};
        s.Availability[1] = 1, s.nValue[1] = 4;
        s.Availability[2] = 2, s.nValue[2] = 1;
        s.Availability[5] = 2, s.nValue[5] = 3;
        s.Availability[20] = 2;  // beyond the nineteen options
    });
    using Sent = std::map<int, std::pair<int, int>>;  // option: availability code and value, when either is set
    Sent sent;
    fake->does("vb_Set_Meter_Options", [&](FakeArgs& a) {
        const SETTINGS_REC& s = a.ref<SETTINGS_REC>();
        sent.clear();
        for (int i = 0; i < 22; ++i)
            if (s.Availability[i] || s.nValue[i]) sent[i] = {s.Availability[i], s.nValue[i]};
    });
    auto general = initialised<Group_General>(fns);
    ASSERT_EQ(general.readFromMeter(), 0);
    ASSERT_EQ(general.Count(), 3);
    EXPECT_EQ(general.OptionByIndex(3), general.OptionByKey(5));
    // What was just read counts as modified: a save writes it back as it is.
    ASSERT_EQ(general.saveToMeter(), 0);
    EXPECT_EQ(sent, (Sent{{1, {1, 0}}, {2, {2, 1}}, {5, {2, 3}}}));

    general.OptionByKey(2)->isModified = false;
    for (auto [value, written] :
         {std::pair{Variant(-2.5), -2}, {Variant(std::string(" 13.5 ")), 14}, {Variant(std::string("abc")), 0}}) {
        general.OptionByKey(5)->setValue(value);
        ASSERT_EQ(general.saveToMeter(), 0);
        EXPECT_EQ(sent, (Sent{{1, {1, 0}}, {5, {2, written}}})) << written;
    }

    const auto kept = general.OptionByKey(5);
    fake->returns("vb_Read_Meter_Options", {ME_COM_ERROR});
    EXPECT_EQ(general.readFromMeter(), ME_COM_ERROR);
    EXPECT_EQ(general.Count(), 3);
    EXPECT_EQ(general.OptionByKey(5), kept);
}

TEST_F(Groups, MedicationNamesOnlyCustomChangesAreSentAndEveryNameDecidesARead) {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    p.insulinNames[12].bytes = "ABCDEFGHIJ";  // no zero byte in the field
    connect(p);
    auto insulins = initialised<Group_Insulins>(*fns);
    auto oralMeds = initialised<Group_OralMeds>(*fns);
    ASSERT_EQ(insulins.readFromMeter(), 0);
    ASSERT_EQ(oralMeds.readFromMeter(), 0);
    EXPECT_EQ(insulins.InsulinName(13), "ABCDEFGHI");

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

    // A name the meter does not give, at any position, fails the read with its code before the favourites.
    for (auto [group, function, position] :
         {std::tuple<MedicationGroup*, const char*, int>{&insulins, "GetInsulinName", 5},
          {&oralMeds, "GetOralMedicationName", 15}}) {
        SCOPED_TRACE(std::string(function) + " " + std::to_string(position));
        const int favouriteCalls = sim::callCount("GetPredefinedInsulins") + sim::callCount("GetPredefinedOralMeds");
        sim::injectFault(function, position, ME_CHKSUM_ERROR, false);
        EXPECT_EQ(group->readFromMeter(), ME_CHKSUM_ERROR);
        EXPECT_EQ(sim::callCount("GetPredefinedInsulins") + sim::callCount("GetPredefinedOralMeds"), favouriteCalls);
        sim::clearFaults();
    }

    const int nameCalls = sim::callCount("GetInsulinName");
    insulins.setInsulinName(14, "Mine");
    SetContinueFlag(false);
    EXPECT_EQ(insulins.readFromMeter(), 0);
    EXPECT_EQ(sim::callCount("GetInsulinName"), nameCalls);
    EXPECT_TRUE(insulins.InsulinNameChanged(14));
}

TEST(TableGroups, PositionsOutsideTheTablesReadEmptyAndFailToWrite) {
    auto keyName = [](int key) {
        SetupOption o;
        o.Key = key;
        return o.KeyName();
    };
    for (auto [key, name] : {std::pair{0, "StripCalCode"}, {11, "Insulinprompt"}, {18, "Pumpuse"}, {19, ""}, {-1, ""}})
        EXPECT_EQ(keyName(key), name) << key;
    Group_Insulins insulins;
    Group_OralMeds oralMeds;
    Group_Schedule schedule;
    EXPECT_EQ(insulins.InsulinName(22), "");
    EXPECT_FALSE(oralMeds.OralMedNameChanged(16));
    EXPECT_EQ(insulins.FavInsulin(4), 0);
    EXPECT_EQ(schedule.ScheduleTime(8), DateTime::fromSerial(-36522));
    EXPECT_EQ(failure([&] { insulins.setInsulinName(22, "x"); }), "9 InsulinName -->  in Group_Insulins");
    EXPECT_EQ(failure([&] { insulins.setFavInsulin(4, 1); }), "9 FavInsulin -->  in Group_Insulins");
    EXPECT_EQ(failure([&] { oralMeds.isOralMedChangeable(16); }), "9 isOralMedChangeable -->  in Group_OralMeds");
    EXPECT_EQ(failure([&] { schedule.setScheduleTime(8, DateTime()); }), "9 ScheduleTime -->  in Group_Schedule");
}

TEST(ScheduleGroup, KeepsQuarterHoursAndSendsZeroForUnchangedSegmentsAndOnlyTheSelectionForTypeZero) {
    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    MEAL_SEGMENTS_TYPE sent{};
    fake->does("SetMealSegments", [&](FakeArgs& a) { sent = a.ref<MEAL_SEGMENTS_TYPE>(); });
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

TEST(MeterSettings, KeepsInsertionOrderAndRefusesADuplicateGroup) {
    MeterSettings settings;
    auto targets = std::make_shared<Group_targets>();
    EXPECT_EQ(settings.AddGroup(5, targets), targets);
    settings.AddGroup(0, std::make_shared<Group_targets>());
    EXPECT_EQ(settings.Item(1), nullptr);
    std::vector<int> order;
    for (const auto& [number, group] : settings) order.push_back(number);
    EXPECT_EQ(order, (std::vector<int>{5, 0}));

    EXPECT_EQ(failure([&] { settings.AddGroup(5, std::make_shared<Group_targets>()); }),
              "51 AddGroup -->  in MeterSettings");
    EXPECT_EQ(settings.Count(), 2);
    EXPECT_EQ(settings.Item(5), targets);
}

TEST(SetupGroup, InterfaceReportsFailureAsTrueAndReturnsTheRecordsCode) {
    Group_targets group;
    EXPECT_EQ(failure([&] { group.ISetupGroup_saveToMeter(); }),
              "91 ISetupGroup_saveToMeter --> saveToMeter -->  in Group_Targets");

    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    fns.MeterRec.port.com_number = 3;
    EXPECT_FALSE(group.ISetupGroup_initialise(fns));
    EXPECT_EQ(group.meterRec().port.com_number, 3);
    EXPECT_FALSE(group.ISetupGroup_readFromMeter());
    // A transport that fails without filling Error_code is still a failure.
    fake->returns("SetTargetRange", {ME_COM_ERROR});
    EXPECT_EQ(group.saveToMeter(), ME_COM_ERROR);

    // A failed read gives the record's code and keeps the old limits.
    fake->does("GetTargetRange", [](FakeArgs& a) { a.rec->Error_code = ME_TIME_OUT, a.ref<std::int16_t>(1) = 99; });
    fake->returns("GetTargetRange", {ME_FAIL, ME_FAIL});
    group.BefMealHighLimit = 140;
    EXPECT_EQ(group.readFromMeter(), ME_TIME_OUT);
    EXPECT_EQ(group.BefMealHighLimit, 140);
    EXPECT_TRUE(group.ISetupGroup_readFromMeter());
}
