// The settings items of the three settings requests, listed once: each item's
// element, how it is handled, and which meter types read it into the settings
// document, describe it in the capabilities document and write it back. A new
// item or meter type is one row, or one more type in a row, here.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <optional>
#include <string_view>

#include "requests/document_values.h"
#include "requests/option_tables.h"
#include "session/meter_dll.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// How a request handles an item.
enum class ItemKind : std::uint8_t {
    clock,
    option,  // one general option, by its option number
    devInit,
    insulins,
    pills,
    schedule,
    targets,
    glucRange,  // the three ranges are only ever read
    glucErrRange,
    glucCalib
};

struct CatalogueItem {
    const char* element;
    ItemKind kind;
    MeterOptions_Enum option;  // ItemKind::option only
    TypeSet read;              // the settings document: a full read, and a listing naming it
    TypeSet described;         // the full capabilities description
    TypeSet listed;            // the capabilities description of a listing naming it
    TypeSet written;           // setDeviceSettings; no type at all: the item is read only
    bool writtenFirst;         // setDeviceSettings writes these before all others
};

namespace catalogue {

constexpr TypeSet kConfigurable = types({1, 2, 3, 5, 7});
constexpr TypeSet kMorvex = types({7});

constexpr CatalogueItem item(const char* element, ItemKind kind, TypeSet read, TypeSet described, TypeSet listed,
                             TypeSet written, bool writtenFirst = false) {
    return {element, kind, eStripCalCode, read, described, listed, written, writtenFirst};
}

// An option is read, described and written for the same types.
constexpr CatalogueItem option(MeterOptions_Enum o, TypeSet offered, bool writtenFirst = false) {
    return {kOptionElements[o].element, ItemKind::option, o, offered, offered, offered, offered, writtenFirst};
}

// A settings group that type 7 alone has.
constexpr CatalogueItem morvexGroup(const char* element, ItemKind kind) {
    return item(element, kind, kMorvex, kMorvex, kMorvex, kMorvex);
}

}  // namespace catalogue

// Every item, in the order the settings and capabilities documents list them.
inline constexpr CatalogueItem kItemCatalogue[] = {
    catalogue::item("Clock", ItemKind::clock, kAllTypes, kAllTypes, kAllTypes, kAllTypes, true),
    catalogue::option(eStripCalCode, catalogue::kConfigurable, true),
    catalogue::option(eBeepStatus, catalogue::kConfigurable, true),
    // The initialised flag is no capability: never described.
    catalogue::item("DevInit", ItemKind::devInit, catalogue::kMorvex, 0, 0, catalogue::kMorvex),
    catalogue::option(eUnits, kAllTypes, true),
    catalogue::option(eNumericSeparator, types({1, 2, 5})),
    catalogue::option(eDateFormat, catalogue::kConfigurable),
    catalogue::option(eTimeFormat, types({1, 2, 3, 5, 6, 7, 8})),
    catalogue::option(eLanguage, catalogue::kConfigurable),
    catalogue::option(eCommunicationMode, types({1, 5})),
    catalogue::option(eCommunicationRate, types({1, 5})),
    catalogue::option(eTranslateNewLang, types({1, 5})),
    catalogue::option(eEvevtAveraging, types({2, 7})),
    catalogue::option(eInsulinPrompt, types({2})),
    catalogue::option(eDisplayLastTest, types({3})),
    catalogue::option(eDayAverage, types({3})),
    catalogue::option(eDisplayClock, types({5})),
    catalogue::option(eDaylightSavings, types({5})),
    catalogue::option(eWeekStartDay, catalogue::kMorvex),
    catalogue::option(eCholestrolUnits, catalogue::kMorvex),
    catalogue::option(eInsulinPumpUse, catalogue::kMorvex),
    catalogue::morvexGroup("Insulins", ItemKind::insulins),
    catalogue::morvexGroup("Pills", ItemKind::pills),
    catalogue::morvexGroup("Schedule", ItemKind::schedule),
    catalogue::morvexGroup("Targets", ItemKind::targets),
    catalogue::item("GlucRange", ItemKind::glucRange, kAllTypes, kAllTypes, kAllTypes, 0),
    catalogue::item("GlucErrRange", ItemKind::glucErrRange, kAllTypes, kAllTypes, kAllTypes, 0),
    // Type 7 reports no calibration of its own, but describes it when asked.
    catalogue::item("GlucCalib", ItemKind::glucCalib, kAllTypes, types({1, 2, 3, 4, 5, 6, 8}), kAllTypes, 0),
};

inline constexpr std::size_t kCatalogueSize = std::size(kItemCatalogue);

constexpr bool elementsDistinct() {
    for (std::size_t i = 0; i < kCatalogueSize; ++i)
        for (std::size_t j = i + 1; j < kCatalogueSize; ++j)
            if (std::string_view(kItemCatalogue[i].element) == kItemCatalogue[j].element) return false;
    return true;
}
static_assert(elementsDistinct(), "a second row with an element name would never be found");

// Whether an element name names the item; type 7's "EvtAvgDurn" names the event-averaging item too.
bool namesItem(const CatalogueItem& item, std::string_view element);
// The row an element name names, if any.
std::optional<std::size_t> catalogueIndex(std::string_view element);

// The highest glucose a meter type reads; type 3 stops lower than the others.
const char* glucoseCeiling(std::int16_t meterType);

// Appends one of the three range items (glucRange, glucErrRange, glucCalib)
// under doc's current element, as both the settings and the capabilities
// documents show it.
void writeRangeItem(XMLWrapper& doc, MeterDll& session, ItemKind kind, std::int16_t meterType);

}  // namespace varnel::detail
