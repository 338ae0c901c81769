#include "settings/general_group.h"

#include <string>
#include <type_traits>
#include <variant>

#include "errors/err_propagator.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "Group_General";
// Option codes 0-18; the record's entries 19-21 are never touched.
constexpr int kOptionCount = 19;

enum Availability : std::int16_t { eLeaveAlone = 0, eAsMarked = 1, eWrite = 2 };

// The option's value read as a number: text as ToNumber reads it, anything
// else that is not a number (empty, a date) as 0.
double numericValue(const Variant& value) {
    return std::visit(
        [](const auto& v) -> double {
            using T = std::decay_t<decltype(v)>;
            if constexpr (std::is_same_v<T, std::int32_t> || std::is_same_v<T, double>)
                return static_cast<double>(v);
            else if constexpr (std::is_same_v<T, std::string>)
                return ToNumber(v);
            else
                return 0.0;
        },
        value);
}

}  // namespace

std::int16_t Group_General::readFromMeter() {
    return guarded(kClass, "readFromMeter", [&]() -> std::int16_t {
        if (std::int16_t code = outcome(transport().vb_Read_Meter_Options(rec_))) return code;
        options_.clear();
        const SETTINGS_REC& s = rec_.Setting;
        for (int i = 0; i < kOptionCount; ++i) {
            if (s.Availability[i] == 0) continue;
            add(i, s.nValue[i], s.Availability[i], s.nValue_min[i], s.nValue_max[i], 0, s.Status[i] != 0);
        }
        return 0;
    });
}

std::int16_t Group_General::saveToMeter() {
    return guarded(kClass, "saveToMeter", [&] {
        SETTINGS_REC out{};
        for (int i = 0; i < kOptionCount; ++i) {
            std::shared_ptr<SetupOption> option = OptionByKey(i);
            if (!option) continue;
            if (option->SettingType == eAsMarked) {
                out.Availability[i] = eAsMarked;
            } else if (option->isModified) {
                out.Availability[i] = eWrite;
                out.nValue[i] = roundToInt16(numericValue(option->Value()));
            }
        }
        return outcome(transport().vb_Set_Meter_Options(rec_, out));
    });
}

std::shared_ptr<SetupOption> Group_General::OptionByIndex(std::int32_t position) const {
    if (position < 1 || position > Count()) return nullptr;
    return options_[static_cast<std::size_t>(position - 1)];
}

std::shared_ptr<SetupOption> Group_General::OptionByKey(std::int32_t key) const {
    for (const auto& option : options_)
        if (option->Key == key) return option;
    return nullptr;
}

bool Group_General::add(std::int32_t key, std::int16_t value, std::int32_t settingType, std::int32_t minValue,
                        std::int32_t maxValue, std::int32_t dataType, bool isRecent) {
    return guarded(kClass, "add", [&] {
        auto option = std::make_shared<SetupOption>();
        option->Key = key;
        option->DataType = dataType;
        option->SettingType = settingType;
        option->setValue(std::int32_t{value});
        option->MinValue = minValue;
        option->MaxValue = maxValue;
        option->isRecentFromMeter = isRecent;
        options_.push_back(std::move(option));
        return true;
    });
}

}  // namespace varnel::detail
