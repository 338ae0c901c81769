#include <gtest/gtest.h>

#include <algorithm>
#include <set>

#include "errors/err_propagator.h"
#include "readings/meter_models.h"
#include "settings/general_group.h"
#include "settings/medication_groups.h"
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

TEST(MeterModelFactory, ErrorsCarryTheModelsClassTextAndRoutine) {
    errPropagator().reset();
    EXPECT_THROW(createMeterModel(eQuillaandBremo)->GetReadingFromMeter(), ComponentError);
    const IError& e = errPropagator().error();
    EXPECT_EQ(std::tuple(e.ErrorNo, e.ErrorTrace, errPropagator().ClassName),
              std::tuple(errc::missing_object, "GetReadingFromMeter --> ", "clsQuilla&Bremo"));
}

TEST_F(Models, MorvexReadsTheNamesOnlyAfterASuccessfulUpload) {
    open(eMorvex);
    auto& insulins = group<Group_Insulins>(2);
    insulins.setInsulinName(12, "Stale");
    sim::injectFault("GetMeterDatalog", 1, ME_TIME_OUT, false);
    EXPECT_EQ(model->GetReadingFromMeter(), ME_TIME_OUT);
    EXPECT_EQ(insulins.InsulinName(12), "");  // never a name of an earlier session
    EXPECT_EQ(sim::callCount("GetOralMedicationName") + sim::callCount("GetInsulinName"), 0);

    ASSERT_EQ(model->GetReadingFromMeter(), 0);
    const sim::MeterProfile m = sim::meter();
    EXPECT_EQ(insulins.InsulinName(12), m.insulinNames[11].bytes);
    EXPECT_EQ(group<Group_OralMeds>(3).OralMedName(6), m.oralMedNames[5].bytes);
    ResultCollection results;
    EXPECT_TRUE(model->MeterUpload(results));
    // Injections name the meter's own insulins, taken from the table just read.
    std::set<std::string> known, named;
    for (const auto& slot : m.insulinNames) known.insert(slot.bytes);
    for (const auto& r : results)
        if (auto injection = std::dynamic_pointer_cast<InsulinInjection>(r)) named.insert(injection->InsulinName());
    ASSERT_FALSE(named.empty());
    EXPECT_TRUE(std::includes(known.begin(), known.end(), named.begin(), named.end()));
}

TEST_F(Models, SetupReportsProgressPerGroupAndStopsAtTheFirstFailure) {
    struct Case {
        int type;
        const char* failing;  // the Morvex reads its schedule right after the general options
        std::vector<int> before, all;
    };
    for (const Case& c : {Case{eCVPellis, "vb_Read_Meter_Options", {50}, {50, 100}},
                          Case{eMorvex, "GetScheduleSelection", {10, 30}, {10, 30, 50, 70, 90, 100}}}) {
        SCOPED_TRACE(c.type);
        open(c.type);
        progress.clear();
        sim::injectFault(c.failing, 1, ME_COM_ERROR, false);
        EXPECT_EQ(model->MeterSetup(), ME_COM_ERROR);
        EXPECT_EQ(progress, c.before);
        for (const char* unread : {"GetInsulinName", "GetOralMedicationName", "GetTargetRange"})
            EXPECT_EQ(sim::callCount(unread), 0) << unread;
        progress.clear();
        EXPECT_EQ(model->MeterSetup(), 0);
        EXPECT_EQ(progress, c.all);
        EXPECT_GT(group<Group_General>(1).Count(), 0);
        // Then its datalog uploads and converts.
        ResultCollection results;
        ASSERT_EQ(model->GetReadingFromMeter(), 0);
        EXPECT_TRUE(model->MeterUpload(results));
        EXPECT_GT(results.Count(), 0);
    }
}
