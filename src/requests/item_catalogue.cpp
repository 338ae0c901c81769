#include "requests/item_catalogue.h"

#include <string>

namespace varnel::detail {

bool namesItem(const CatalogueItem& item, std::string_view element) {
    if (element == item.element) return true;
    return item.kind == ItemKind::option && item.option == eEvevtAveraging && element == kEvtAvgDurnElement.element;
}

std::optional<std::size_t> catalogueIndex(std::string_view element) {
    for (std::size_t i = 0; i < kCatalogueSize; ++i)
        if (namesItem(kItemCatalogue[i], element)) return i;
    return std::nullopt;
}

const char* glucoseCeiling(std::int16_t meterType) { return meterType == eDunmark ? "768" : "1023"; }

void writeRangeItem(XMLWrapper& doc, MeterDll& session, ItemKind kind, std::int16_t meterType) {
    switch (kind) {
    case ItemKind::glucRange:
        doc.AddElement("GlucRange");
        doc.SetAttribute("High", std::to_string(session.GlucoseHigh()));
        doc.SetAttribute("Low", std::to_string(session.GlucoseLow()));
        break;
    case ItemKind::glucErrRange:
        doc.AddElement("GlucErrRange");
        doc.SetAttribute("High", glucoseCeiling(meterType));
        doc.SetAttribute("Low", "-1");
        break;
    case ItemKind::glucCalib: {
        const bool plasma = session.Calibration() != 0;
        doc.AddElement("GlucCalib", plasma ? "1" : "0");
        doc.SetAttribute("Txt", plasma ? "Plasma" : "Whole Blood");
        break;
    }
    default:
        return;  // no range item
    }
    // Read only, whatever the meter.
    doc.SetAttribute("Mode", "0");
}

}  // namespace varnel::detail
