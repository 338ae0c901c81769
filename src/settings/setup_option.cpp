#include "settings/setup_option.h"

#include <iterator>
#include <utility>

namespace varnel::detail {

namespace {

// Names by MeterOptions_Enum value.
constexpr const char* kKeyNames[] = {
    "StripCalCode", "Beeper", "GluUnits", "Punctuation", "Dateformat",    "Timeformat",   "Language",
    "CommMode",     "Baud",   "Xlate",    "Averaging",   "Insulinprompt", "Showlasttest", "Avg1430",
    "Showclock",    "DST",    "BOW",      "ChoUnits",    "Pumpuse",
};

}  // namespace

void SetupOption::setValue(Variant value) {
    value_ = std::move(value);
    isModified = true;
}

std::string SetupOption::KeyName() const {
    if (Key < 0 || Key >= static_cast<std::int32_t>(std::size(kKeyNames))) return {};
    return kKeyNames[Key];
}

}  // namespace varnel::detail
