#include "settings/setup_group.h"

#include "errors/err_propagator.h"

namespace varnel::detail {

bool ISetupGroup::ISetupGroup_initialise(const MeterLink& link) {
    return guarded(className(), "ISetupGroup_initialise", [&] { return initialise(link); });
}

bool ISetupGroup::ISetupGroup_readFromMeter() {
    return guarded(className(), "ISetupGroup_readFromMeter", [&] { return readFromMeter() != 0; });
}

bool ISetupGroup::ISetupGroup_saveToMeter() {
    return guarded(className(), "ISetupGroup_saveToMeter", [&] { return saveToMeter() != 0; });
}

bool ISetupGroup::initialise(const MeterLink& link) {
    return guarded(className(), "initialise", [&] {
        rec_ = link.MeterRec;
        transport_ = link.transport;
        clearValues();
        return false;
    });
}

Transport& ISetupGroup::transport() {
    if (!transport_) raise(errc::missing_object, "The settings group has not been initialised");
    return *transport_;
}

std::int16_t ISetupGroup::outcome(std::int16_t returned) const {
    if (returned == 0) return 0;
    return rec_.Error_code != 0 ? rec_.Error_code : returned;
}

}  // namespace varnel::detail
