// The capabilities request: which settings the connected meter has, whether
// each can be changed and within which limits, and which kinds of records it
// keeps. Either everything its type offers or the names a client lists.
#include <algorithm>
#include <array>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "requests/discovery.h"
#include "requests/document_values.h"
#include "requests/item_catalogue.h"
#include "requests/option_tables.h"
#include "requests/option_writers.h"
#include "requests/request_frame.h"
#include "requests/settings_requests.h"
#include "settings/schedule_group.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

struct Limits {
    const char* min = nullptr;  // null: no limits
    const char* max = nullptr;  // null with a min: the meter type's glucose ceiling
};

struct Part {
    const char* name = nullptr;  // null: unused
    Limits limits;
    bool morvexOnly = false;
};

struct RecordRow {
    const char* name;
    TypeSet types;
    Limits limits;
    std::array<Part, 4> parts{};
    bool described = true;  // false: accepted in a listing, never described
};

// The record kinds, in the order they are described.
constexpr RecordRow kRecords[] = {
    {"Gluc", kAllTypes, {"0", nullptr}},
    {"Strip", types({1, 2, 5}), {}},
    {"OralMed", types({7}), {"0", "5.0"}},
    {"Ins", types({2, 7}), {"0", "250.0"}},
    {"MBolus", types({2, 7}), {"0", "60.0"}},
    {"MTDD", types({7}), {"0", "100.0"}},
    {"Food",
     types({2, 7}),
     {},
     {{{"Carbs", {"0", "250"}},
       {"SFat", {"0", "250"}, true},
       {"Cals", {"0", "2500"}, true},
       {"Protein", {"0", "250"}, true}}}},
    {"Alcohol", types({7}), {}},
    {"MicroAlbumin", types({7}), {"0", "1000"}},
    {"HbA1c", types({7}), {"4.0", "15.0"}},
    {"Ketones", types({7}), {"0", "4"}},
    {"HtWt", types({7}), {}, {{{"Ht", {"0", "255.0"}}, {"Wt", {"0", "600.0"}}}}},
    {"BP", types({7}), {}, {{{"Syst", {"80", "200"}}, {"Diast", {"40", "150"}}}}},
    {"Choles",
     types({7}),
     {},
     {{{"LDL", {"0", "501"}}, {"HDL", {"0", "501"}}, {"Total", {"0", "1001"}}, {"Trig", {"0", "3001"}}}}},
    {"Visit", types({7}), {}, {}, false},
    {"HNotes", types({7}), {}, {}, false},
    {"Exercise", types({7}), {}, {}, false},
};

constexpr std::size_t kRecordCount = std::size(kRecords);

// The medication lists of type 7: fixed names, custom names, favourites.
struct MedicationCaps {
    const char* preMax;
    const char* customMax;
    const char* favoriteMax;
};
constexpr MedicationCaps kInsulinCaps{"10", "11", "3"};
constexpr MedicationCaps kPillCaps{"5", "10", "5"};
constexpr const char* kCustomNameLength = "8";

// What one request describes.
struct Wanted {
    std::array<bool, kCatalogueSize> settings{};
    std::array<bool, kRecordCount> records{};
    std::int32_t count = 0;  // sets the progress step
    bool failure = false;    // a listed name was refused
    bool accepted = false;   // something was accepted or described
    std::string strError;
};

Wanted fullDescription(std::int16_t meterType) {
    Wanted w;
    for (std::size_t i = 0; i < kCatalogueSize; ++i) w.settings[i] = has(kItemCatalogue[i].described, meterType);
    for (std::size_t i = 0; i < kRecordCount; ++i)
        w.records[i] = kRecords[i].described && has(kRecords[i].types, meterType);
    for (bool b : w.settings) w.count += b;
    for (bool b : w.records) w.count += b;
    return w;
}

// Walks the children of the current element, flagging the names the type
// has and noting the others.
template <class Row, std::size_t N, class Accepts>
void walkListing(XMLWrapper& caps, const Row (&rows)[N], std::array<bool, N>& flags, Wanted& w, Accepts accepts) {
    for (std::int32_t i = 0, n = caps.GetChildCount(); i < n; ++i) {
        const std::string name = caps.GetChildName(i);
        bool found = false;
        for (std::size_t r = 0; r < N && !found; ++r) {
            if (accepts(rows[r], name)) {
                flags[r] = found = true;
                w.accepted = true;
                ++w.count;
            }
        }
        if (!found) {
            w.failure = true;
            w.strError += name + " is not supported;";
        }
    }
}

// Reads the names a client lists; the description of what makes the listing unusable, if anything.
std::optional<std::string> readListing(XMLWrapper& caps, std::int16_t meterType, Wanted& w) {
    const std::string invalid = ErrorDescription(ME_INVALID_XMLWRAPPOBJ);
    caps.MoveToRoot();
    if (caps.GetRootName() != "DeviceCaps") return invalid + " ;";
    if (caps.CountElements("Settings") != 1) return invalid + " ;Settings node missing in Device capabilities";
    caps.MoveToChild("Settings");
    walkListing(caps, kItemCatalogue, w.settings, w, [&](const CatalogueItem& item, const std::string& name) {
        return has(item.listed, meterType) && namesItem(item, name);
    });
    caps.MoveToRoot();
    if (caps.CountElements("Records") != 1) return invalid + " ;Records node missing in Device capabilities";
    caps.MoveToChild("Records");
    walkListing(caps, kRecords, w.records, w, [&](const RecordRow& row, const std::string& name) {
        return has(row.types, meterType) && name == row.name;
    });
    if (w.accepted) return std::nullopt;
    // The refused names stay in the report, so the client can tell what it asked for wrongly.
    std::string description = ErrorDescription(ME_FAIL) + "; " + invalid;
    if (!w.strError.empty()) description += ";" + w.strError;
    return description;
}

void setLimits(XMLWrapper& doc, const Limits& limits, std::int16_t meterType, bool child) {
    if (!limits.min) return;
    const std::string max = limits.max ? limits.max : glucoseCeiling(meterType);
    if (child) {
        doc.SetChildAttribute("Min", limits.min);
        doc.SetChildAttribute("Max", max);
    } else {
        doc.SetAttribute("Min", limits.min);
        doc.SetAttribute("Max", max);
    }
}

// Builds the description into the capabilities document, element by element.
class CapsWriter {
public:
    CapsWriter(Request& req, XMLWrapper& caps, MeterModel* meter, Wanted& wanted)
        : req_(req),
          session_(req.session),
          caps_(caps),
          meter_(meter),
          wanted_(wanted),
          copy_(session_.storedRecord()),
          type_(copy_.M_Type),
          progress_(wanted.count) {}

    // Describes the wanted settings: 0, or the code of the read that failed (reported).
    // The device description; a failed firmware read is reported like any failed read.
    std::int16_t device() {
        if (const IdentityFailure f = writeDeviceDescription(caps_, session_)) return readFailed(f.code, f.context);
        return 0;
    }

    std::int16_t settings() {
        caps_.MoveToRoot();
        caps_.MoveToChild("Settings");
        for (std::size_t i = 0; i < kCatalogueSize; ++i) {
            if (!wanted_.settings[i]) continue;
            if (std::int16_t c = setting(kItemCatalogue[i])) return c;
        }
        return 0;
    }

    void records() {
        caps_.MoveToRoot();
        caps_.MoveToChild("Records");
        for (std::size_t i = 0; i < kRecordCount; ++i) {
            const RecordRow& row = kRecords[i];
            if (!wanted_.records[i] || !row.described) continue;
            caps_.AddElement(row.name);
            setLimits(caps_, row.limits, type_, false);
            for (const Part& part : row.parts) {
                if (!part.name || (part.morvexOnly && type_ != eMorvex)) continue;
                caps_.AddChildElement(part.name);
                setLimits(caps_, part.limits, type_, true);
            }
            advance();
        }
    }

private:
    std::int16_t setting(const CatalogueItem& item) {
        switch (item.kind) {
        case ItemKind::clock:
            return clock();
        case ItemKind::option:
            return option(item.option);
        case ItemKind::schedule:
            return schedule();
        case ItemKind::insulins:
            medication("Insulins", kInsulinCaps);
            break;
        case ItemKind::pills:
            medication("Pills", kPillCaps);
            break;
        case ItemKind::targets:
            targets();
            break;
        case ItemKind::glucRange:
        case ItemKind::glucErrRange:
        case ItemKind::glucCalib:
            writeRangeItem(caps_, session_, item.kind, type_);
            break;
        case ItemKind::devInit:
            return 0;  // never described
        }
        advance();
        return 0;
    }

    std::int16_t readFailed(std::int16_t c, const std::string& text) {
        req_.report(ME_FAIL, c, ErrorDescription(ME_FAIL) + ";" + wanted_.strError + ";" + ErrorDescription(c) + text);
        return c;
    }

    std::int16_t clock() {
        if (!meter_) return 0;
        std::shared_ptr<ISetupGroup> group = meter_->Settings().Item(eGroupClock);
        if (!group) return 0;
        group->initialise(session_.meterFns());
        if (std::int16_t c = group->readFromMeter()) return readFailed(c, " ; Clock setting failed");
        caps_.AddElement("Clock");
        caps_.SetAttribute("Mode", "1");
        std::int32_t first = 0, last = 0;
        getMinMaxDates(session_.LastMeterType(), first, last);
        for (auto [name, day] : {std::pair{"Min", first}, std::pair{"Max", last}}) {
            const DateTime date = DateTime::fromSerial(day);
            caps_.AddChildElement(name);
            for (const auto& [attribute, value] : dateAttributes(date, false))
                caps_.SetChildAttribute(attribute, value);
        }
        advance();
        return 0;
    }

    std::int16_t option(MeterOptions_Enum option) {
        if (copy_.Setting.Availability[option] == 0) return 0;
        if (std::int16_t c = session_.transport().vb_Read_Meter_Option(copy_, option)) {
            // An option is named as its writer is, without "Set".
            return readFailed(c, std::string(" ; ") + (optionWriterName(option) + 3) + " setting failed");
        }
        wanted_.accepted = true;
        const char* element = optionElement(option);
        if (element) {
            const SETTINGS_REC& s = copy_.Setting;
            caps_.AddElement(element);
            if (const char* mode = modeText(s.Availability[option])) caps_.SetAttribute("Mode", mode);
            if (option == eCommunicationRate) {
                caps_.SetAttribute("Min", type_ == eCVTolvoMeter ? "3" : "0");
                caps_.SetAttribute("Max", "3");
            } else {
                caps_.SetAttribute("Min", std::to_string(s.nValue_min[option]));
                caps_.SetAttribute("Max", std::to_string(s.nValue_max[option]));
            }
            if (option == eLanguage) languages();
        }
        advance();
        return 0;
    }

    // The element of an option; event averaging has one only on the types that show it.
    const char* optionElement(MeterOptions_Enum option) const {
        const std::int16_t last = session_.LastMeterType();
        if (option == eEvevtAveraging && last != eCVPellis && last != eDunmark && last != eMorvex) return nullptr;
        return optionElementRow(option, last).element;
    }

    void languages() {
        caps_.AddChildElement("ValidLang");
        const std::int32_t n = std::clamp<std::int32_t>(copy_.langMap.numLanguages, 0, 20);
        for (std::int32_t i = 0; i < n; ++i) {
            const std::int16_t code = copy_.langMap.languages[i];
            caps_.AddChildElement("Lang", "ValidLang", std::to_string(code));
            if (const char* word = languageWord(code)) caps_.SetChildAttribute("Txt", word);
        }
    }

    std::int16_t schedule() {
        auto group =
            meter_ ? std::dynamic_pointer_cast<Group_Schedule>(meter_->Settings().Item(eGroupSchedule)) : nullptr;
        if (!group) return 0;
        group->initialise(session_.meterFns());
        if (std::int16_t c = group->readFromMeter()) return readFailed(c, "Schedule setting failed");
        caps_.AddElement("Schedule");
        caps_.SetAttribute("Custom", group->ScheduleType != 0 ? "true" : "false");
        caps_.SetAttribute("Mode", "1");
        advance();
        return 0;
    }

    void medication(const char* element, const MedicationCaps& m) {
        caps_.AddElement(element);
        caps_.AddChildElement("Pre");
        caps_.SetChildAttribute("Mode", "0");
        caps_.SetChildAttribute("Max", m.preMax);
        caps_.AddChildElement("Custom");
        caps_.SetChildAttribute("Max", m.customMax);
        caps_.SetChildAttribute("Mode", "1");
        caps_.SetChildAttribute("StrLen", kCustomNameLength);
        caps_.AddChildElement("Favorite");
        caps_.SetChildAttribute("Max", m.favoriteMax);
        caps_.SetChildAttribute("Mode", "1");
    }

    void targets() {
        caps_.AddElement("Targets");
        caps_.SetAttribute("Mode", "1");
        caps_.SetAttribute("Unit", "0");
        caps_.SetAttribute("UTxt", "mg/dL");
        for (const TargetElement& target : kTargetElements) {
            caps_.AddChildElement(target.element);
            setLimits(caps_, {target.min, target.max}, type_, true);
        }
    }

    void advance() { progress_.advance(req_.owner); }

    Request& req_;
    MeterDll& session_;
    XMLWrapper& caps_;
    MeterModel* meter_;
    Wanted& wanted_;
    METER_REC copy_;
    std::int16_t type_;
    ItemProgress progress_;
};

}  // namespace

std::int32_t getDeviceCaps(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                           XMLWrapper& deviceCaps, bool blnFetchAllInfo, XMLWrapper& status, bool& blnCheckMeter) {
    Request req(owner, "getDeviceCaps", udtMeterRec, &status);
    return req.run([&]() -> std::int32_t {
        MeterDll& session = req.session;
        req.ensureSession();
        if (!req.readPort(deviceInfo)) return req.complete(ME_BAD_PARAMETER);
        blnCheckMeter = true;
        session.initMeter(udtMeterRec);

        std::shared_ptr<MeterModel> meter;
        const auto closing = [&](std::int32_t result) {
            req.close();
            meter.reset();
            return req.complete(result);
        };
        if (!req.readIdentity(deviceInfo)) return closing(ME_BAD_PARAMETER);

        meter = session.Meter();
        const std::int16_t meterType = session.storedRecord().M_Type;
        Wanted wanted;
        if (blnFetchAllInfo) {
            wanted = fullDescription(meterType);
        } else if (std::optional<std::string> invalid = readListing(deviceCaps, meterType, wanted)) {
            req.report(ME_FAIL, ME_INVALID_XMLWRAPPOBJ, *invalid);
            return closing(ME_FAIL);
        }

        CapsWriter writer(req, deviceCaps, meter.get(), wanted);
        if (meter) {
            SetContinueFlag(true);
            status.InitDocument(doc_kind::status);
            deviceCaps.InitDocument(doc_kind::device_caps);
            if (std::int16_t c = writer.device()) return closing(c);
            if (std::int16_t c = writer.settings()) return closing(c);
        }
        writer.records();

        if (std::int32_t c = req.checkMeter()) return c;
        SetContinueFlag(true);
        if (req.compareIdentity() != 0) return req.complete(ME_FAIL);

        meter.reset();
        if (wanted.failure && wanted.accepted) {
            req.report(ME_PARTIALSUCCESS, ME_PARTIALSUCCESS,
                       ErrorDescription(ME_PARTIALSUCCESS) + ";" + wanted.strError);
            return req.complete(ME_PARTIALSUCCESS);
        }
        if (wanted.failure) {
            req.fail(ME_FAIL, ";" + wanted.strError);
            return req.complete(ME_FAIL);
        }
        req.report(ME_SUCCESS, ME_SUCCESS, ErrorDescription(ME_SUCCESS));
        return req.complete(ME_SUCCESS);
    });
}

}  // namespace varnel::detail
