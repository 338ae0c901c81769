#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "readings/meter_fns.h"
#include "settings/meter_settings.h"
#include "settings/setup_option.h"
#include "settings/targets_group.h"
#include "support/fake_transport.h"

using namespace varnel;
using namespace varnel::detail;

TEST(SetupOption, NamesFollowTheOptionCodesAndOnlyAssignmentMarksAChange) {
    SetupOption o;
    const std::pair<int, const char*> names[] = {{0, "StripCalCode"}, {3, "Punctuation"}, {11, "Insulinprompt"},
                                                 {15, "DST"},         {16, "BOW"},         {18, "Pumpuse"},
                                                 {19, ""},            {-1, ""}};
    for (auto [key, name] : names) {
        o.Key = key;
        EXPECT_EQ(o.KeyName(), name) << key;
        EXPECT_EQ(o.KeyText(), "yes");
    }
    EXPECT_TRUE(isEmpty(o.Value()));
    EXPECT_FALSE(o.isModified);
    (void)o.Value();
    EXPECT_FALSE(o.isModified);
    o.setValue(std::string("7"));
    EXPECT_TRUE(o.isModified);
    EXPECT_EQ(std::get<std::string>(o.Value()), "7");
}

TEST(MeterSettings, KeepsInsertionOrderAndRefusesADuplicateGroup) {
    errPropagator().reset();
    MeterSettings settings;
    auto targets = std::make_shared<Group_targets>();
    EXPECT_EQ(settings.AddGroup(5, targets), targets);
    settings.AddGroup(0, std::make_shared<Group_targets>());
    EXPECT_EQ(settings.Count(), 2);
    EXPECT_EQ(settings.Item(5), targets);
    EXPECT_EQ(settings.Item(1), nullptr);
    EXPECT_EQ(settings.Item(-1), nullptr);
    std::vector<int> order;
    for (const auto& [number, group] : settings) order.push_back(number);
    EXPECT_EQ(order, (std::vector<int>{5, 0}));

    try {
        settings.AddGroup(5, std::make_shared<Group_targets>());
        FAIL() << "duplicate accepted";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "AddGroup --> ");
        EXPECT_EQ(errPropagator().ClassName, "MeterSettings");
    }
    EXPECT_EQ(settings.Count(), 2);
    EXPECT_EQ(settings.Item(5), targets);
}

TEST(SetupGroup, InterfaceReportsFailureAsTrueAndReturnsTheRecordsCode) {
    errPropagator().reset();
    Group_targets unready;
    try {
        unready.ISetupGroup_saveToMeter();
        FAIL() << "used before initialise";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "ISetupGroup_saveToMeter --> saveToMeter --> ");
        EXPECT_EQ(errPropagator().ClassName, "Group_Targets");
    }

    auto fake = std::make_shared<test::FakeTransport>();
    clsMeterFns fns(fake);
    fns.MeterRec.port.com_number = 3;
    Group_targets group;
    EXPECT_FALSE(group.ISetupGroup_initialise(fns));
    EXPECT_EQ(group.meterRec().port.com_number, 3);

    EXPECT_FALSE(group.ISetupGroup_readFromMeter());
    // A transport that fails without filling Error_code is still a failure.
    fake->returns("SetTargetRange", {ME_COM_ERROR});
    EXPECT_EQ(group.saveToMeter(), ME_COM_ERROR);

    fake->does("GetTargetRange", [](test::FakeArgs& a) { a.rec->Error_code = ME_TIME_OUT; });
    fake->returns("GetTargetRange", {ME_FAIL, ME_FAIL});
    EXPECT_EQ(group.readFromMeter(), ME_TIME_OUT);
    EXPECT_TRUE(group.ISetupGroup_readFromMeter());
}
