#include <gtest/gtest.h>

#include <algorithm>
#include <set>

#include "errors/err_propagator.h"
#include "readings/meter_models.h"
#include "settings/medication_groups.h"
#include "support/sim_session.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

struct Models : test::SimSession {
    std::unique_ptr<MeterModel> model;
    void open(int type) {
        connect(type);
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
