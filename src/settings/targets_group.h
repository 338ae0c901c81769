// Group 5: the meter's glucose target limits, in the meter's units.
#pragma once

#include <cstdint>

#include "settings/setup_group.h"

namespace varnel::detail {

class Group_targets : public ISetupGroup {
public:
    std::int16_t BefMealLowLimit = 0;
    std::int16_t AftMealLowLimit = 0;
    std::int16_t AftMealHighLimit = 0;
    std::int16_t BefMealHighLimit = 0;
    std::int16_t HypoLevel = 0;

    // A failed read keeps the old limits.
    std::int16_t readFromMeter() override;
    std::int16_t saveToMeter() override;
    const char* className() const override { return "Group_Targets"; }
};

}  // namespace varnel::detail
