// One meter setting with its value, limits and flags.
#pragma once

#include <cstdint>
#include <string>

#include "util/variant.h"

namespace varnel::detail {

class SetupOption {
public:
    // Availability code as the meter reported it; 2 marks a writable option.
    std::int32_t SettingType = 0;
    // The meter's status flag for the option.
    bool isRecentFromMeter = false;
    // Option code, a MeterOptions_Enum value.
    std::int32_t Key = 0;
    // Data-type code; always 0 here.
    std::int32_t DataType = 0;
    std::int32_t MinValue = 0;
    std::int32_t MaxValue = 0;
    // Set by every assignment of Value; cleared only by callers.
    bool isModified = false;

    const Variant& Value() const { return value_; }
    // Stores the value and marks the option modified.
    void setValue(Variant value);

    // The option's name for its Key; "" for a key outside 0-18.
    std::string KeyName() const;

private:
    Variant value_;
};

}  // namespace varnel::detail
