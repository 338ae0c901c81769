#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "readings/meter_fns.h"
#include "settings/meter_settings.h"
#include "settings/setup_option.h"
#include "settings/targets_group.h"
#include "support/fake_transport.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::detail;

TEST(SetupOption, NamesFollowTheOptionCodesAndOnlyAssignmentMarksAChange) {
    SetupOption o;
    for (auto [key, name] : {std::pair{0, "StripCalCode"}, {11, "Insulinprompt"}, {16, "BOW"}, {18, "Pumpuse"},
                             {19, ""}, {-1, ""}}) {
        o.Key = key;
        EXPECT_EQ(o.KeyName(), name) << key;
    }
    EXPECT_TRUE(isEmpty(o.Value()));
    EXPECT_FALSE(o.isModified);
    o.setValue(std::string("7"));
    EXPECT_TRUE(o.isModified);
    EXPECT_EQ(std::get<std::string>(o.Value()), "7");
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

    EXPECT_EQ(test::unexpectedTrace([&] { settings.AddGroup(5, std::make_shared<Group_targets>()); }),
              std::to_string(errc::internal) + " AddGroup --> ");
    EXPECT_EQ(errPropagator().ClassName, "MeterSettings");
    EXPECT_EQ(settings.Count(), 2);
    EXPECT_EQ(settings.Item(5), targets);
}

TEST(SetupGroup, InterfaceReportsFailureAsTrueAndReturnsTheRecordsCode) {
    Group_targets group;
    EXPECT_EQ(test::unexpectedTrace([&] { group.ISetupGroup_saveToMeter(); }),
              std::to_string(errc::missing_object) + " ISetupGroup_saveToMeter --> saveToMeter --> ");
    EXPECT_EQ(errPropagator().ClassName, "Group_Targets");

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
    fake->does("GetTargetRange", [](test::FakeArgs& a) {
        a.rec->Error_code = ME_TIME_OUT;
        a.ref<std::int16_t>(1) = 99;
    });
    fake->returns("GetTargetRange", {ME_FAIL, ME_FAIL});
    group.BefMealHighLimit = 140;
    EXPECT_EQ(group.readFromMeter(), ME_TIME_OUT);
    EXPECT_EQ(group.BefMealHighLimit, 140);
    EXPECT_TRUE(group.ISetupGroup_readFromMeter());
}
