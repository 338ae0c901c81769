// The device settings request: reads the meter's settings into the device
// configuration document, every item the meter type offers or the ones the
// client lists under "Settings".
#include <array>
#include <memory>
#include <optional>
#include <string>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "requests/discovery.h"
#include "requests/document_values.h"
#include "requests/item_catalogue.h"
#include "requests/option_elements.h"
#include "requests/option_tables.h"
#include "requests/request_frame.h"
#include "requests/settings_requests.h"
#include "settings/clock_group.h"
#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "settings/targets_group.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

// How one medication table appears in the document.
template <class G>
struct MedicationItem {
    std::int32_t group;
    const char* element;
    const char* child;
    std::int32_t fixedCount;  // positions shown under "Pre"; the rest go under "Custom"
    const char* customMax;
    const char* favouriteMax;
    const char* failure;
    std::string (G::*name)(std::int32_t) const;
    std::int16_t (G::*favourite)(std::int32_t) const;
    std::int32_t (G::*favouriteCount)() const;
    bool (G::*changeable)(std::int32_t);
};

constexpr MedicationItem<Group_Insulins> kInsulinItem{eGroupInsulins,
                                                      "Insulins",
                                                      "Insulin",
                                                      10,
                                                      "11",
                                                      "3",
                                                      " ; Insulins setting failed",
                                                      &Group_Insulins::InsulinName,
                                                      &Group_Insulins::FavInsulin,
                                                      &Group_Insulins::FavInsulinCount,
                                                      &Group_Insulins::isInsulinChangeable};

constexpr MedicationItem<Group_OralMeds> kPillItem{eGroupOralMeds,
                                                   "Pills",
                                                   "Pill",
                                                   5,
                                                   "10",
                                                   "5",
                                                   " ; OralMeds setting failed",
                                                   &Group_OralMeds::OralMedName,
                                                   &Group_OralMeds::FavOralMed,
                                                   &Group_OralMeds::FavOralMedsCount,
                                                   &Group_OralMeds::isOralMedChangeable};

// Day, month ("00") and year of a date as child attributes of the last added child.
void setDateAttributes(XMLWrapper& doc, const DateTime& date) {
    for (const auto& [attribute, value] : dateAttributes(date, false)) doc.SetChildAttribute(attribute, value);
}

// The document has exactly one "Settings" element below its document element.
bool hasOneSettings(XMLWrapper& doc) {
    try {
        doc.MoveToRoot();
        return doc.CountElements("Settings") == 1;
    } catch (...) {
        return false;
    }
}

// One getDeviceSettings request. Each step gives back the request's result
// when it ends the request, nothing when the request goes on.
class SettingsRequest {
public:
    using Exit = std::optional<std::int32_t>;

    SettingsRequest(Request& req, XMLWrapper& deviceInfo, XMLWrapper& cfg, XMLWrapper& status, bool fetchAll)
        : req_(req),
          deviceInfo_(deviceInfo),
          cfg_(cfg),
          status_(status),
          fetchAll_(fetchAll),
          options_(req.session, record_, message_) {}

    std::int32_t run(bool& blnCheckMeter);
    // The report of a run-time error met while the document has no single "Settings": the result, or nothing.
    Exit settingsMissing();

private:
    std::int32_t end(std::int32_t result) {
        meter_.reset();
        return req_.complete(result);
    }
    std::int32_t closeAndEnd(std::int32_t result) {
        req_.close();
        return end(result);
    }
    // A failed meter read: the message takes the failure, which is reported; the meter is closed.
    std::int32_t readFailed(std::int16_t code, const char* text);
    // The group after a fresh read; null when the model has none or the read failed (then exit is set).
    ISetupGroup* readGroup(std::int32_t number, const char* failure, Exit& exit);
    void advance();

    Exit chooseItems();
    Exit writeItem(const CatalogueItem& item);
    Exit writeClock();
    Exit writeDevInit();
    template <class G>
    Exit writeMedications(const MedicationItem<G>& item);
    Exit writeSchedule();
    Exit writeTargets();
    std::int32_t finish();

    Request& req_;
    XMLWrapper& deviceInfo_;
    XMLWrapper& cfg_;
    XMLWrapper& status_;
    const bool fetchAll_;
    METER_REC record_{};
    std::shared_ptr<MeterModel> meter_;
    std::array<bool, kCatalogueSize> wanted_{};
    std::int32_t listed_ = 0;  // children of the client's "Settings"
    ItemProgress progress_;
    std::string message_;
    bool unsupported_ = false;
    bool read_ = false;
    OptionElements options_;
};

std::int32_t SettingsRequest::readFailed(std::int16_t code, const char* text) {
    message_ = ErrorDescription(ME_FAIL) + ";" + message_ + ";" + ErrorDescription(code) + text;
    req_.report(ME_FAIL, code, message_);
    return closeAndEnd(code);
}

ISetupGroup* SettingsRequest::readGroup(std::int32_t number, const char* failure, Exit& exit) {
    std::shared_ptr<ISetupGroup> group = meter_->Settings().Item(number);
    if (!group) return nullptr;
    group->initialise(req_.session.meterFns());
    if (const std::int16_t c = group->readFromMeter()) {
        exit = readFailed(c, failure);
        return nullptr;
    }
    read_ = true;
    return group.get();
}

void SettingsRequest::advance() { progress_.advance(req_.owner); }

SettingsRequest::Exit SettingsRequest::chooseItems() {
    const std::int16_t type = record_.M_Type;
    std::int32_t count = 0;
    if (fetchAll_) {
        for (std::size_t i = 0; i < kCatalogueSize; ++i) {
            wanted_[i] = has(kItemCatalogue[i].read, type);
            count += wanted_[i];
        }
    } else {
        cfg_.MoveToRoot();
        if (cfg_.GetRootName() != "DeviceSettings") {
            req_.report(ME_FAIL, ME_INVALID_XMLWRAPPOBJ, ErrorDescription(ME_INVALID_XMLWRAPPOBJ) + " ;");
            return closeAndEnd(ME_FAIL);
        }
        cfg_.MoveToChild("Settings");
        listed_ = cfg_.GetChildCount();
        if (listed_ == 0) {
            req_.report(ME_FAIL, ME_INVALID_XMLWRAPPOBJ, ErrorDescription(ME_INVALID_XMLWRAPPOBJ));
            return closeAndEnd(ME_FAIL);
        }
        for (std::int32_t i = 0; i < listed_; ++i) {
            const std::string name = cfg_.GetChildName(i);
            const std::optional<std::size_t> item = catalogueIndex(name);
            if (item && has(kItemCatalogue[*item].read, type)) {
                wanted_[*item] = true;
                ++count;
            } else {
                unsupported_ = true;
                message_ += name + " is not supported;";
            }
        }
    }
    progress_ = ItemProgress(count);
    return std::nullopt;
}

SettingsRequest::Exit SettingsRequest::writeClock() {
    Exit exit;
    auto* clock = static_cast<Group_Clock*>(readGroup(eGroupClock, " ; Clock setting failed", exit));
    if (!clock) return exit;
    DateTime now;
    if (const std::int16_t c = clock->readClockTime(now)) return readFailed(c, " ; Clock setting failed");
    cfg_.AddElement("Clock");
    cfg_.SetAttribute("Mode", "1");
    advance();

    std::int32_t minDate = 0;
    std::int32_t maxDate = 0;
    getMinMaxDates(req_.session.LastMeterType(), minDate, maxDate);
    cfg_.AddChildElement("Val");
    for (const auto& [attribute, value] : dateAttributes(now, true)) cfg_.SetChildAttribute(attribute, value);
    cfg_.AddChildElement("Min");
    setDateAttributes(cfg_, DateTime::fromSerial(minDate));
    cfg_.AddChildElement("Max");
    setDateAttributes(cfg_, DateTime::fromSerial(maxDate));

    // A client asking only for the clock gets it without the identity check.
    const bool clockOnly = !fetchAll_ && listed_ == 1;
    if (clockOnly) {
        req_.report(ME_SUCCESS, ME_SUCCESS, ErrorDescription(ME_SUCCESS));
        return end(ME_SUCCESS);
    }
    return std::nullopt;
}

SettingsRequest::Exit SettingsRequest::writeDevInit() {
    std::int16_t value = 0;
    // A flag that could not be read is not "No".
    if (const std::int16_t c = req_.session.readDevInitialised(value))
        return readFailed(c, " ; DevInit setting failed");
    cfg_.AddElement("DevInit", std::to_string(value));
    cfg_.SetAttribute("Mode", "1");
    cfg_.SetAttribute("Txt", value == 0 ? "No" : "Yes");
    cfg_.SetAttribute("Min", "0");
    cfg_.SetAttribute("Max", "1");
    advance();
    return std::nullopt;
}

template <class G>
SettingsRequest::Exit SettingsRequest::writeMedications(const MedicationItem<G>& item) {
    Exit exit;
    auto* group = static_cast<G*>(readGroup(item.group, item.failure, exit));
    if (!group) return exit;

    cfg_.AddElement(item.element);
    cfg_.AddChildElement("Pre");
    cfg_.SetChildAttribute("Mode", "0");
    for (std::int32_t p = 1; p <= group->Count(); ++p) {
        if (p == item.fixedCount + 1) {
            cfg_.AddChildElement("Custom");
            cfg_.SetChildAttribute("Max", item.customMax);
            cfg_.SetChildAttribute("Mode", "1");
        }
        cfg_.AddChildElement(item.child, p <= item.fixedCount ? "Pre" : "Custom", std::to_string(p));
        // Names the meter will not let anyone rename are the ones in use.
        cfg_.SetChildAttribute("InUse", (group->*item.changeable)(p) ? "false" : "true");
        cfg_.SetChildAttribute("Txt", (group->*item.name)(p));
    }
    cfg_.AddChildElement("Favorite");
    cfg_.SetChildAttribute("Max", item.favouriteMax);
    cfg_.SetChildAttribute("Mode", "1");
    for (std::int32_t j = 1; j <= (group->*item.favouriteCount)(); ++j) {
        const std::int16_t position = (group->*item.favourite)(j);
        if (position <= 0) continue;
        cfg_.AddChildElement(item.child, "Favorite", std::to_string(position));
        cfg_.SetChildAttribute("Txt", (group->*item.name)(position));
    }
    advance();
    return std::nullopt;
}

SettingsRequest::Exit SettingsRequest::writeSchedule() {
    Exit exit;
    auto* schedule = static_cast<Group_Schedule*>(readGroup(eGroupSchedule, " ; Schedule setting failed", exit));
    if (!schedule) return exit;
    advance();
    cfg_.AddElement("Schedule");
    cfg_.SetAttribute("Custom", schedule->ScheduleType == 1 ? "true" : "false");
    cfg_.SetAttribute("Mode", "1");
    for (std::int32_t s = 1; s <= schedule->Count(); ++s) {
        const DateTime start = schedule->ScheduleTime(s);
        cfg_.AddChildElement(kMealSegments[static_cast<std::size_t>(s - 1)]);
        cfg_.SetChildAttribute("h", std::to_string(start.hour()));
        cfg_.SetChildAttribute("m", std::to_string(start.minute()));
    }
    return std::nullopt;
}

SettingsRequest::Exit SettingsRequest::writeTargets() {
    Exit exit;
    auto* targets = static_cast<Group_targets*>(readGroup(eGroupTargets, " ; Targets setting failed", exit));
    if (!targets) return exit;
    advance();
    cfg_.AddElement("Targets");
    cfg_.SetAttribute("Mode", "1");
    // The limits are in the meter's glucose unit, read here unless the unit element already was.
    if (!wanted_[*catalogueIndex(kOptionElements[eUnits].element)]) {
        if (const std::int16_t c = req_.session.transport().vb_Read_Meter_Option(record_, eUnits))
            return readFailed(c, " ; Target Units settings failed");
        read_ = true;
    }
    const bool mmol = record_.Setting.nValue[eUnits] != 0;
    cfg_.SetAttribute("Unit", mmol ? "1" : "0");
    cfg_.SetAttribute("UTxt", kOptionElements[eUnits].words[mmol ? 1 : 0]);
    for (const TargetElement& limit : kTargetElements) {
        cfg_.AddChildElement(limit.element, "", std::to_string(targets->*limit.limit));
        cfg_.SetChildAttribute("Min", limit.min);
        cfg_.SetChildAttribute("Max", limit.max);
    }
    return std::nullopt;
}

SettingsRequest::Exit SettingsRequest::writeItem(const CatalogueItem& item) {
    switch (item.kind) {
    case ItemKind::clock:
        return writeClock();
    case ItemKind::option:
        if (const std::int16_t r = options_.write(cfg_, item.option, status_)) return closeAndEnd(r);
        if (!options_.bulk()) read_ = true;
        advance();
        return std::nullopt;
    case ItemKind::devInit:
        return writeDevInit();
    case ItemKind::insulins:
        return writeMedications(kInsulinItem);
    case ItemKind::pills:
        return writeMedications(kPillItem);
    case ItemKind::schedule:
        return writeSchedule();
    case ItemKind::targets:
        return writeTargets();
    case ItemKind::glucRange:
    case ItemKind::glucErrRange:
    case ItemKind::glucCalib:
        writeRangeItem(cfg_, req_.session, item.kind, req_.session.storedRecord().M_Type);
        advance();
        return std::nullopt;
    }
    return std::nullopt;
}

std::int32_t SettingsRequest::finish() {
    if (const std::int32_t c = req_.checkMeter()) return end(c);
    SetContinueFlag(true);
    if (req_.compareIdentity() != 0) return end(ME_FAIL);
    cfg_.MoveToRoot();
    if (unsupported_ && read_)
        req_.report(ME_PARTIALSUCCESS, ME_PARTIALSUCCESS, ErrorDescription(ME_PARTIALSUCCESS) + ";" + message_);
    else if (unsupported_)
        req_.report(ME_FAIL, ME_FAIL, ErrorDescription(ME_FAIL) + ";" + message_);
    else
        req_.report(ME_SUCCESS, ME_SUCCESS, ErrorDescription(ME_SUCCESS));
    return end(ME_SUCCESS);
}

std::int32_t SettingsRequest::run(bool& blnCheckMeter) {
    MeterDll& session = req_.session;
    req_.ensureSession();
    if (!req_.usePort(Request::portText(deviceInfo_), ME_COM_ERROR, " ; Port number from XML file is invalid"))
        return end(ME_FAIL);
    blnCheckMeter = true;
    session.initMeter(req_.rec);
    SetContinueFlag(true);
    if (!req_.readIdentity(deviceInfo_)) return closeAndEnd(ME_FAIL);

    meter_ = session.Meter();
    record_ = session.storedRecord();
    if (Exit exit = chooseItems()) return *exit;

    cfg_.InitDocument(doc_kind::device_settings);
    if (const IdentityFailure f = writeDeviceDescription(cfg_, session)) return readFailed(f.code, f.context);
    if (!meter_) {
        req_.fail(ME_FAIL);
        return closeAndEnd(ME_FAIL);
    }
    SetContinueFlag(true);
    cfg_.MoveToRoot();
    cfg_.MoveToChild("Settings");

    bool optionWanted = false;
    for (std::size_t i = 0; i < kCatalogueSize; ++i)
        optionWanted |= wanted_[i] && kItemCatalogue[i].kind == ItemKind::option;
    for (std::size_t i = 0; i < kCatalogueSize; ++i) {
        if (!wanted_[i]) continue;
        const CatalogueItem& item = kItemCatalogue[i];
        // Meters read in bulk give all their options at once, right after the clock.
        if (item.kind != ItemKind::clock && optionWanted) {
            optionWanted = false;
            if (const std::int16_t g = options_.fetch(status_)) return closeAndEnd(g);
            if (options_.bulk()) read_ = true;
        }
        if (Exit exit = writeItem(item)) return *exit;
    }
    return finish();
}

SettingsRequest::Exit SettingsRequest::settingsMissing() {
    if (hasOneSettings(cfg_)) return std::nullopt;
    req_.report(ME_FAIL, ME_INVALID_XMLWRAPPOBJ,
                ErrorDescription(ME_INVALID_XMLWRAPPOBJ) + " ;Settings node missing in Device settings");
    return closeAndEnd(ME_FAIL);
}

}  // namespace

std::int32_t getDeviceSettings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                               XMLWrapper& deviceCfg, bool blnFetchAllInfo, XMLWrapper& status, bool& blnCheckMeter) {
    Request req(owner, "getDeviceSettings", udtMeterRec, &status);
    SettingsRequest request(req, deviceInfo, deviceCfg, status, blnFetchAllInfo);
    return req.run([&]() -> std::int32_t {
        try {
            return request.run(blnCheckMeter);
        } catch (...) {
            if (SettingsRequest::Exit exit = request.settingsMissing()) return *exit;
            throw;
        }
    });
}

}  // namespace varnel::detail
