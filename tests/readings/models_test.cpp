#include <gtest/gtest.h>

#include <algorithm>
#include <set>

#include "component/err_propagator.h"
#include "readings/meter_models.h"
#include "settings/clock_group.h"
#include "settings/general_group.h"
#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "settings/targets_group.h"
#include "support/fake_transport.h"
#include "support/sim_session.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

struct Models : test::SimSession {
    std::unique_ptr<MeterModel> model;
    std::vector<int> progress;

    void open(int type) {
        connect(type);
        fns->onProgress = [this](std::int16_t& p) { progress.push_back(p); };
        model = createMeterModel(type);
        model->initialise(fns);
    }
    template <class G>
    G& group(int number) {
        return dynamic_cast<G&>(*model->Settings().Item(number));
    }
};

}  // namespace

TEST(MeterModelFactory, ClassTextAndGroupsFollowTheMeterType) {
    const char* names[] = {"clsCVMorvex", "clsCVTarnConsumer", "clsCVPellis", "clsDunmark", "clsQuilla&Bremo",
                           "clsCVTolvo",  "clsCVZenta",        "clsCVMorvex", "clsParvix",  "clsCVMorvex"};
    auto fns = std::make_shared<clsMeterFns>(std::make_shared<test::FakeTransport>());
    for (int type = 0; type <= 9; ++type) {
        auto model = createMeterModel(type);
        EXPECT_STREQ(model->className(), names[type]) << type;
        EXPECT_FALSE(model->initialise(fns));
        const bool morvex = std::string(names[type]) == "clsCVMorvex";
        MeterSettings& settings = model->Settings();
        ASSERT_EQ(settings.Count(), morvex ? 6 : 2) << type;
        std::vector<int> order;
        for (const auto& [number, group] : settings) order.push_back(number);
        EXPECT_EQ(order, (morvex ? std::vector<int>{0, 1, 2, 3, 4, 5} : std::vector<int>{0, 1}));
        EXPECT_NE(std::dynamic_pointer_cast<Group_Clock>(settings.Item(0)), nullptr);
        EXPECT_NE(std::dynamic_pointer_cast<Group_General>(settings.Item(1)), nullptr);
        if (!morvex) {
            for (int g = 2; g <= 5; ++g) EXPECT_EQ(settings.Item(g), nullptr);
            continue;
        }
        EXPECT_NE(std::dynamic_pointer_cast<Group_Insulins>(settings.Item(2)), nullptr);
        EXPECT_NE(std::dynamic_pointer_cast<Group_OralMeds>(settings.Item(3)), nullptr);
        EXPECT_NE(std::dynamic_pointer_cast<Group_Schedule>(settings.Item(4)), nullptr);
        EXPECT_NE(std::dynamic_pointer_cast<Group_targets>(settings.Item(5)), nullptr);
    }
}

TEST(MeterModelFactory, ErrorsCarryTheModelsClassTextAndRoutine) {
    errPropagator().reset();
    auto model = createMeterModel(eQuillaandBremo);
    try {
        model->GetReadingFromMeter();
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "GetReadingFromMeter --> ");
        EXPECT_EQ(errPropagator().ClassName, "clsQuilla&Bremo");
    }
}

TEST_F(Models, MorvexReadsTheNamesOnlyAfterASuccessfulUpload) {
    open(eMorvex);
    auto& insulins = group<Group_Insulins>(2);
    insulins.setInsulinName(12, "Stale");
    sim::injectFault("GetMeterDatalog", 1, ME_TIME_OUT, false);
    EXPECT_EQ(model->GetReadingFromMeter(), ME_TIME_OUT);
    EXPECT_EQ(insulins.InsulinName(12), "");
    EXPECT_EQ(insulins.meterRec().port.com_number, fns->MeterRec.port.com_number);
    EXPECT_EQ(sim::callCount("GetOralMedicationName") + sim::callCount("GetInsulinName"), 0);

    ASSERT_EQ(model->GetReadingFromMeter(), 0);
    const sim::MeterProfile m = sim::meter();
    EXPECT_EQ(insulins.InsulinName(12), m.insulinNames[11].bytes);
    EXPECT_EQ(group<Group_OralMeds>(3).OralMedName(6), m.oralMedNames[5].bytes);

    ResultCollection results;
    std::string serial;
    std::int16_t type = eMorvex;
    EXPECT_TRUE(model->MeterUpload(serial, type, results));
    // Injections name the meter's own insulins, taken from the table just read.
    std::set<std::string> known, named;
    for (const auto& slot : m.insulinNames) known.insert(slot.bytes);
    for (const auto& r : results)
        if (auto injection = std::dynamic_pointer_cast<InsulinInjection>(r)) named.insert(injection->InsulinName());
    ASSERT_FALSE(named.empty());
    EXPECT_TRUE(std::includes(known.begin(), known.end(), named.begin(), named.end()));
}

TEST_F(Models, MorvexSetupReportsProgressPerGroupAndStopsAtTheSchedule) {
    open(eMorvex);
    EXPECT_EQ(model->MeterSetup(), 0);
    EXPECT_EQ(progress, (std::vector<int>{10, 30, 50, 70, 90, 100}));
    EXPECT_EQ(group<Group_targets>(5).HypoLevel, sim::meter().targets.hypo);

    progress.clear();
    sim::reset();
    open(eMorvex);
    sim::injectFault("GetScheduleSelection", 1, ME_COM_ERROR, false);
    EXPECT_EQ(model->MeterSetup(), ME_COM_ERROR);
    EXPECT_EQ(progress, (std::vector<int>{10, 30}));
    for (const char* unread : {"GetInsulinName", "GetOralMedicationName", "GetTargetRange"})
        EXPECT_EQ(sim::callCount(unread), 0) << unread;
}

TEST_F(Models, StandardModelsUploadRecordsAndReportHalfwayProgress) {
    open(eCVPellis);
    EXPECT_EQ(model->MeterSetup(), 0);
    EXPECT_EQ(progress, (std::vector<int>{50, 100}));
    EXPECT_GT(group<Group_General>(1).Count(), 0);

    ASSERT_EQ(model->GetReadingFromMeter(), 0);
    ResultCollection results;
    std::string serial;
    std::int16_t type = eCVPellis;
    EXPECT_TRUE(model->MeterUpload(serial, type, results));
    EXPECT_GT(results.Count(), 0);

    progress.clear();
    sim::injectFault("vb_Read_Meter_Options", 1, ME_NO_DEVICE, false);
    EXPECT_EQ(model->MeterSetup(), ME_NO_DEVICE);
    EXPECT_EQ(progress, (std::vector<int>{50}));
}
