#include "readings/meter_models.h"

#include "errors/err_propagator.h"
#include "settings/clock_group.h"
#include "settings/general_group.h"
#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "settings/targets_group.h"

namespace varnel::detail {

namespace {

constexpr std::int32_t kStandardGroups[] = {eGroupClock, eGroupGeneral};
constexpr std::int16_t kStandardProgress[] = {50, 100};

constexpr std::int32_t kMorvexGroups[] = {eGroupClock,    eGroupGeneral,  eGroupInsulins,
                                          eGroupOralMeds, eGroupSchedule, eGroupTargets};
// The schedule is read right after the general options.
constexpr std::int32_t kMorvexSetupOrder[] = {eGroupClock,    eGroupGeneral,  eGroupSchedule,
                                              eGroupInsulins, eGroupOralMeds, eGroupTargets};
constexpr std::int16_t kMorvexProgress[] = {10, 30, 50, 70, 90, 100};

std::shared_ptr<ISetupGroup> newGroup(std::int32_t number) {
    switch (number) {
    case eGroupClock:
        return std::make_shared<Group_Clock>();
    case eGroupGeneral:
        return std::make_shared<Group_General>();
    case eGroupInsulins:
        return std::make_shared<Group_Insulins>();
    case eGroupOralMeds:
        return std::make_shared<Group_OralMeds>();
    case eGroupSchedule:
        return std::make_shared<Group_Schedule>();
    case eGroupTargets:
        return std::make_shared<Group_targets>();
    default:
        raise(errc::internal, "No settings group " + std::to_string(number));
    }
}

}  // namespace

MeterModel::MeterModel(const char* className, const Layout& layout) : className_(className), layout_(layout) {}

MeterSettings& MeterModel::Settings() {
    if (!mobjSettings) raise(errc::missing_object, "The meter model has not been initialised");
    return *mobjSettings;
}

clsMeterFns& MeterModel::meterFns() {
    if (!mobjMeterFns) raise(errc::missing_object, "The meter model has no meter functions");
    return *mobjMeterFns;
}

ISetupGroup& MeterModel::group(std::int32_t number) {
    std::shared_ptr<ISetupGroup> g = Settings().Item(number);
    if (!g) raise(errc::missing_object, "The meter model has no settings group " + std::to_string(number));
    return *g;
}

bool MeterModel::initialise(std::shared_ptr<clsMeterFns> objMeterFns) {
    return guarded(className_, "initialise", [&] {
        mobjMeterFns = std::move(objMeterFns);
        auto settings = std::make_unique<MeterSettings>();
        for (std::int32_t number : layout_.groups) settings->AddGroup(number, newGroup(number));
        mobjSettings = std::move(settings);
        return false;
    });
}

std::int16_t MeterModel::MeterSetup() {
    return guarded(className_, "MeterSetup", [&]() -> std::int16_t {
        clsMeterFns& fns = meterFns();
        for (std::int32_t number : layout_.setupOrder) group(number).ISetupGroup_initialise(fns);
        for (std::size_t i = 0; i < layout_.setupOrder.size(); ++i) {
            if (std::int16_t code = group(layout_.setupOrder[i]).readFromMeter()) return code;
            fns.updateProgress(layout_.progress[i]);
        }
        return 0;
    });
}

StandardMeterModel::StandardMeterModel(const char* className)
    : MeterModel(className, {kStandardGroups, kStandardGroups, kStandardProgress}) {}

std::int16_t StandardMeterModel::GetReadingFromMeter() {
    return guarded(className(), "GetReadingFromMeter", [&] { return meterFns().GetNonFastMeterReading(); });
}

bool StandardMeterModel::MeterUpload(ResultCollection& objresultcol) {
    return guarded(className(), "MeterUpload", [&] { return meterFns().NonFastmeterUpload(objresultcol); });
}

clsCVMorvex::clsCVMorvex() : MeterModel("clsCVMorvex", {kMorvexGroups, kMorvexSetupOrder, kMorvexProgress}) {}

std::int16_t clsCVMorvex::GetReadingFromMeter() {
    return guarded(className(), "GetReadingFromMeter", [&] {
        clsMeterFns& fns = meterFns();
        std::int16_t result = fns.GetFastmeterReading();
        // Initialised whatever the upload gave, so the names never come from an older session.
        group(eGroupOralMeds).ISetupGroup_initialise(fns);
        group(eGroupInsulins).ISetupGroup_initialise(fns);
        if (result == 0) result = group(eGroupOralMeds).readFromMeter();
        if (result == 0) result = group(eGroupInsulins).readFromMeter();
        return result;
    });
}

bool clsCVMorvex::MeterUpload(ResultCollection& objresultcol) {
    return guarded(className(), "MeterUpload", [&] {
        std::vector<std::string> oralMeds = groupAs<Group_OralMeds>(eGroupOralMeds).OralMedsArray();
        std::vector<std::string> insulins = groupAs<Group_Insulins>(eGroupInsulins).InsulinsArray();
        return meterFns().Fastmeterupload(objresultcol, oralMeds, insulins);
    });
}

std::unique_ptr<MeterModel> createMeterModel(std::int32_t meterType) {
    switch (meterType) {
    case eCVTarnConsumerMeter:
        return std::make_unique<clsCVTarnConsumer>();
    case eCVPellis:
        return std::make_unique<clsCVPellis>();
    case eDunmark:
        return std::make_unique<clsDunmark>();
    case eQuillaandBremo:
        return std::make_unique<clsQuillaandbremo>();
    case eCVTolvoMeter:
        return std::make_unique<clsCVTolvo>();
    case eCorviaZenta:
        return std::make_unique<clsCVZenta>();
    case eParvix:
        return std::make_unique<clsParvix>();
    default:
        return std::make_unique<clsCVMorvex>();
    }
}

}  // namespace varnel::detail
