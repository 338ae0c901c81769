#include "settings/targets_group.h"

#include "errors/err_propagator.h"

namespace varnel::detail {

namespace {
constexpr const char* kClass = "Group_Targets";
}  // namespace

std::int16_t Group_targets::readFromMeter() {
    return guarded(kClass, "readFromMeter", [&]() -> std::int16_t {
        std::int16_t befLow = 0, befHigh = 0, aftLow = 0, aftHigh = 0, hypo = 0;
        if (std::int16_t code = outcome(transport().GetTargetRange(rec_, befLow, befHigh, aftLow, aftHigh, hypo)))
            return code;
        BefMealLowLimit = befLow;
        BefMealHighLimit = befHigh;
        AftMealLowLimit = aftLow;
        AftMealHighLimit = aftHigh;
        HypoLevel = hypo;
        return 0;
    });
}

std::int16_t Group_targets::saveToMeter() {
    return guarded(kClass, "saveToMeter", [&] {
        return outcome(transport().SetTargetRange(rec_, BefMealLowLimit, BefMealHighLimit, AftMealLowLimit,
                                                  AftMealHighLimit, HypoLevel));
    });
}

}  // namespace varnel::detail
