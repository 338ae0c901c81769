#include <gtest/gtest.h>

#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "settings/targets_group.h"
#include "support/fake_transport.h"
#include "support/sim_session.h"

using namespace varnel;
using namespace varnel::detail;
using test::FakeArgs;

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

    const int nameCalls = sim::callCount("GetInsulinName");
    insulins.setInsulinName(14, "Mine");
    SetContinueFlag(false);
    EXPECT_EQ(insulins.readFromMeter(), 0);
    EXPECT_EQ(sim::callCount("GetInsulinName"), nameCalls);
    EXPECT_TRUE(insulins.InsulinNameChanged(14));
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

TEST(SetupGroup, InterfaceReportsFailureAsTrueAndReturnsTheRecordsCode) {
    Group_targets group;
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
