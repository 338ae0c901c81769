// The words of the settings documents: how each general option of a meter
// appears as an element (name, value mapping, value words), the language
// words, the schedule's segments and the targets. Shared by the settings,
// capabilities and configuration documents.
#pragma once

#include <array>
#include <cstdint>

#include "settings/targets_group.h"
#include "varnel/records.h"

namespace varnel::detail {

// How a raw option value becomes the value a document shows.
enum class OptionMapping : std::uint8_t {
    raw,
    inverted,  // 0 shows as 1, anything else as 0 (the meter stores "off" flags)
    reversed,  // 3 - raw, raw 0-3 only (baud codes run from fastest to slowest)
};

// Words of document values 0-4; null where a value has no word.
using OptionWords = std::array<const char*, 5>;

// One general option as a document element.
struct OptionElementRow {
    const char* element;
    MeterOptions_Enum option;
    OptionMapping mapping;
    OptionWords words;
};

// The 19 general options, indexed by MeterOptions_Enum (also their document order).
inline constexpr std::array<OptionElementRow, 19> kOptionElements{{
    {"CC", eStripCalCode, OptionMapping::raw, {}},
    {"Beep", eBeepStatus, OptionMapping::inverted, {"Off", "On"}},
    {"GlucUnit", eUnits, OptionMapping::raw, {"mg/dL", "mmol/L"}},
    {"Decimal", eNumericSeparator, OptionMapping::raw, {".", ","}},
    {"DateFormat", eDateFormat, OptionMapping::raw, {"M/D/Y", "D/M/Y"}},
    {"TimeFormat", eTimeFormat, OptionMapping::raw, {"AM/PM", "24-Hour"}},
    {"Language", eLanguage, OptionMapping::raw, {}},  // words from kLanguageWords
    {"CommMode", eCommunicationMode, OptionMapping::raw, {"RS232", "Data Manager", "Data A", "Data B"}},
    {"Baud", eCommunicationRate, OptionMapping::reversed, {"300", "1200", "2400", "9600"}},
    {"NewLang", eTranslateNewLang, OptionMapping::raw, {"English", "Native"}},
    {"EvtAvg", eEvevtAveraging, OptionMapping::raw, {"Off", "On"}},
    {"InsPrompt", eInsulinPrompt, OptionMapping::raw, {"No", "Yes"}},
    {"ShowLastResult", eDisplayLastTest, OptionMapping::inverted, {"No", "Yes"}},
    {"DaysAveraged", eDayAverage, OptionMapping::inverted, {"No", "Yes"}},
    {"ShowClock", eDisplayClock, OptionMapping::inverted, {"No", "Yes"}},
    {"DayLight", eDaylightSavings, OptionMapping::inverted, {"No", "Yes"}},
    {"WeekBegin", eWeekStartDay, OptionMapping::raw, {"Monday", "Sunday"}},
    {"CholesUnit", eCholestrolUnits, OptionMapping::raw, {"mg/dL", "mmol/L"}},
    {"PumpUse", eInsulinPumpUse, OptionMapping::inverted, {"No", "Yes"}},
}};

constexpr bool indexedByOption() {
    for (std::size_t i = 0; i < kOptionElements.size(); ++i)
        if (kOptionElements[i].option != static_cast<MeterOptions_Enum>(i)) return false;
    return true;
}
static_assert(indexedByOption(), "kOptionElements rows must follow MeterOptions_Enum");

// Event averaging as type 7 offers it: an averaging period instead of on/off.
inline constexpr OptionElementRow kEvtAvgDurnElement{
    "EvtAvgDurn", eEvevtAveraging, OptionMapping::raw, {"7 Days", "14 Days", "30 Days", "60 Days", "90 Days"}};

// Language words by language code 0-19.
inline constexpr std::array<const char*, 20> kLanguageWords{
    "English", "Spanish",         "French", "Italian", "Dutch",     "Portuguese", "Swedish",
    "German",  "Symbolic",        "Danish", "Finnish", "Norwegian", "Polish",     "Hungarian",
    "Turkish", "Czechoslovakian", "Greek",  "Russian", "Japanese",  "British"};

// The row of an option as the meter type (the session's LastMeterType) shows it.
constexpr const OptionElementRow& optionElementRow(MeterOptions_Enum option, std::int16_t lastMeterType) {
    if (option == eEvevtAveraging && lastMeterType == eMorvex) return kEvtAvgDurnElement;
    return kOptionElements[static_cast<std::size_t>(option)];
}

// The document value of a raw value; false when the value has none (a baud code outside 0-3).
constexpr bool documentValue(const OptionElementRow& row, std::int16_t raw, std::int16_t& value) {
    switch (row.mapping) {
    case OptionMapping::inverted:
        value = raw == 0 ? 1 : 0;
        return true;
    case OptionMapping::reversed:
        if (raw < 0 || raw > 3) return false;
        value = static_cast<std::int16_t>(3 - raw);
        return true;
    case OptionMapping::raw:
        break;
    }
    value = raw;
    return true;
}

// The word of a document value, or null when it has none.
constexpr const char* optionWord(const OptionElementRow& row, std::int32_t value) {
    if (row.option == eLanguage)
        return value >= 0 && value < static_cast<std::int32_t>(kLanguageWords.size()) ? kLanguageWords[value] : nullptr;
    return value >= 0 && value < static_cast<std::int32_t>(row.words.size()) ? row.words[value] : nullptr;
}

// The word of a language code, or null outside 0-19.
constexpr const char* languageWord(std::int32_t code) { return optionWord(kOptionElements[eLanguage], code); }

// The "Mode" text of an option availability: "0" read-only, "1" writable, null otherwise.
constexpr const char* modeText(std::int16_t availability) {
    return availability == 1 ? "0" : availability == 2 ? "1" : nullptr;
}

// Schedule segment elements, by segment number 1-7 (segment s at s - 1).
inline constexpr std::array<const char*, 7> kMealSegments{"PreB", "PostB", "PreL", "PostL", "PreD", "PostD", "Night"};

// A glucose target as an element: the limit of the targets group it holds and the range documents show.
struct TargetElement {
    const char* element;
    std::int16_t Group_targets::*limit;
    const char* min;
    const char* max;
};

// The targets in document order.
inline constexpr std::array<TargetElement, 5> kTargetElements{{
    {"PreMealLow", &Group_targets::BefMealLowLimit, "60", "200"},
    {"PreMealHigh", &Group_targets::BefMealHighLimit, "60", "200"},
    {"PostMealLow", &Group_targets::AftMealLowLimit, "60", "200"},
    {"PostMealHigh", &Group_targets::AftMealHighLimit, "60", "200"},
    {"Hypo", &Group_targets::HypoLevel, "50", "90"},
}};

}  // namespace varnel::detail
