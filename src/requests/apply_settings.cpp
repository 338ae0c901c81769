// setDeviceSettings: writes a device configuration document, as the client
// edited it, to the meter it describes.
#include "requests/apply_settings.h"

#include <cmath>
#include <initializer_list>
#include <optional>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "requests/document_values.h"
#include "requests/item_catalogue.h"
#include "requests/option_tables.h"
#include "requests/request_frame.h"
#include "requests/settings_requests.h"
#include "settings/clock_group.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

bool wholeNumber(double v) { return std::floor(v) == v; }

// The clock of "Settings/Clock/Val", refused with a message when it is not a
// time the meter type can hold; nothing is written then.
MissingElement applyClock(ApplyContext& ctx, bool& written) {
    auto clock = std::dynamic_pointer_cast<Group_Clock>(ctx.meter.Settings().Item(eGroupClock));
    if (!clock) return {};
    written = true;
    clock->initialise(ctx.session.meterFns());
    XMLWrapper& cfg = ctx.deviceCfg;
    cfg.SelectElement("Settings");
    if (cfg.CountElements("Clock") != 1) return "Clock";
    cfg.MoveToChild("Clock");
    const auto part = [&](const char* name) { return Trim(cfg.GetChildAttribute("Val", name)); };
    const std::string day = part("D"), month = part("MM"), year = part("Y");
    const std::string h = part("h"), m = part("m"), s = part("s");

    const std::optional<double> hour = DocumentNumber(h), minute = DocumentNumber(m),
                                second = s.empty() ? std::optional<double>(0) : DocumentNumber(s);
    const auto within = [](const std::optional<double>& v, double end) {
        // Fractions are refused too: they would round into the next minute, hour or day.
        return v && *v >= 0 && *v < end && wholeNumber(*v);
    };
    const bool valid = within(hour, 24) && within(minute, 60) && within(second, 60) &&
                       IsValidDate(day + "/" + month + "/" + year, "/", "dd/MM/yyyy");
    if (!valid) {
        ctx.outcome.refuse("Invalid DeviceClock value ; ");
        return {};
    }
    // The date parts are all digits now, and within the calendar.
    const auto datePart = [](const std::string& text) { return static_cast<int>(DocumentNumber(text).value_or(0)); };
    const int y = datePart(year);
    std::int32_t first = 0, last = -1;  // no range: no year test
    getMinMaxDates(ctx.session.storedRecord().M_Type, first, last);
    if (first <= last && (y < DateTime::fromSerial(first).year() || y > DateTime::fromSerial(last).year())) {
        ctx.outcome.refuse("Invalid DeviceClock year value ; ");
        return {};
    }
    clock->setClockTime(*DateTime::fromParts(y, datePart(month), datePart(day), static_cast<int>(*hour),
                                             static_cast<int>(*minute), static_cast<int>(*second)));
    if (clock->saveToMeter() != 0)
        ctx.outcome.refuse("Invalid DeviceClock value ; ");
    else
        ctx.outcome.bSuccess = true;
    return {};
}

// The meter's initialised flag, 0 or 1.
void applyDevInit(ApplyContext& ctx) {
    ctx.deviceCfg.SelectElement("Settings");
    const std::optional<double> flag = DocumentNumber(Trim(ctx.deviceCfg.GetChildValue("DevInit")));
    if (!flag || (*flag != 0 && *flag != 1)) {
        ctx.outcome.refuse("Invalid DevInit value ; ");
        return;
    }
    if (const std::int16_t code = ctx.session.setDevInitialised(*flag == 1 ? 1 : 0))
        ctx.outcome.refuse("Invalid DevInit value ; " + ErrorDescription(code) + ";");
    else
        ctx.outcome.bSuccess = true;
}

// The identity the two documents claim, read before the meter is asked.
struct Claims {
    std::string port;
    std::string infoSerial, infoType;
    std::string cfgSerial, cfgType;
};

// Reports a failure that ends the request (as a plain failure, whatever its major code); always false.
bool stop(Request& req, std::int32_t major, std::int32_t minor, const std::string& context) {
    req.report(major, minor, ErrorDescription(minor) + context);
    return false;
}

// Reads the serial number and type both documents claim; false (reported) when one is missing or invalid.
bool validate(Request& req, XMLWrapper& deviceInfo, XMLWrapper& deviceCfg, Claims& c) {
    deviceInfo.SelectElement("DeviceInfo");
    c.infoSerial = deviceInfo.GetChildValue("SN");
    if (c.infoSerial.empty())
        return stop(req, ME_FAIL, ME_BAD_PARAMETER, " ; Device SN from Device Info XML is invalid");
    c.infoType = deviceInfo.GetChildValue("TypeID");
    if (!Request::validType(c.infoType))
        return stop(req, ME_FAIL, ME_BAD_PARAMETER, " ; Device Type from Device Info XML is invalid");

    deviceCfg.MoveToRoot();
    if (deviceCfg.GetRootName() != "DeviceSettings") return stop(req, ME_FAIL, ME_INVALID_XMLWRAPPOBJ, " ;");
    if (deviceCfg.CountElements("DeviceInfo") != 1)
        return stop(req, ME_FAIL, ME_INVALID_XMLWRAPPOBJ, " ;DeviceInfo missing in Device settings");
    deviceCfg.MoveToChild("DeviceInfo");
    c.cfgType = deviceCfg.GetChildValue("TypeID");
    deviceCfg.MoveToRoot();
    // The settings document's type is refused with the device information's text.
    if (!Request::validType(c.cfgType))
        return stop(req, ME_FAIL, ME_BAD_PARAMETER, " ; Device Type from Device Info XML is invalid");
    deviceCfg.SelectElement("DeviceInfo");
    c.cfgSerial = deviceCfg.GetChildValue("SN");
    deviceCfg.MoveToRoot();
    if (c.cfgSerial.empty())
        return stop(req, ME_FAIL, ME_BAD_PARAMETER, " ; Device SN from Device settings XML is invalid");
    return true;
}

// Attaches to the meter on the claimed port and checks it is the one both
// documents describe; false (reported) when it is not.
bool identify(Request& req, METER_REC& udtMeterRec, const Claims& c) {
    if (!req.usePort(c.port, ME_COM_ERROR, " ; Port number from XML is invalid")) return false;
    req.session.initMeter(udtMeterRec);
    if (req.checkMeter() != 0) return false;
    return req.sameSerial(c.cfgSerial, "Device settings XML") && req.sameType(c.cfgType, "Device settings XML") &&
           req.sameType(c.infoType, "Device Info XML") && req.sameSerial(c.infoSerial, "Device Info XML");
}

// Writes the "Settings" items the meter type accepts, in catalogue order with
// the rows marked writtenFirst ahead, and refuses the others into the outcome;
// false (reported) when the document lacks an element a write needs or the
// meter has no model.
bool apply(Request& req, XMLWrapper& deviceCfg, XMLWrapper& status, WriteOutcome& outcome) {
    const auto invalidXml = [&](const std::string& context) {
        return stop(req, ME_FAIL, ME_INVALID_XMLWRAPPOBJ, context);
    };
    MeterDll& session = req.session;
    const std::int16_t meterType = session.storedRecord().M_Type;
    deviceCfg.MoveToRoot();
    if (deviceCfg.CountElements("Settings") != 1) return invalidXml(" ;Settings missing in Device settings");
    deviceCfg.MoveToChild("Settings");
    const std::int32_t children = deviceCfg.GetChildCount();
    if (children == 0) return invalidXml("");

    bool wanted[kCatalogueSize] = {};
    int accepted = 0;
    for (std::int32_t i = 0; i < children; ++i) {
        const std::string name = deviceCfg.GetChildName(i);
        const std::optional<std::size_t> item = catalogueIndex(name);
        if (item && has(kItemCatalogue[*item].written, meterType)) {
            wanted[*item] = true;
            ++accepted;
        } else if (item && kItemCatalogue[*item].written == 0) {
            outcome.refuse(name + " value is read only;");
        } else {
            outcome.refuse(name + " is not supported;");
        }
    }

    std::shared_ptr<MeterModel> meter = session.Meter();
    ItemProgress progress(accepted);
    if (!meter) return stop(req, ME_FAIL, ME_NO_DEVICE, "");

    // One stage of 0-100, whatever an earlier request left.
    req.owner.resetPercentage();
    req.owner.PercentLimit(100);
    ApplyContext ctx{session, *meter, deviceCfg, outcome};
    for (const bool first : {true, false}) {
        for (std::size_t i = 0; i < kCatalogueSize; ++i) {
            const CatalogueItem& item = kItemCatalogue[i];
            if (!wanted[i] || item.writtenFirst != first) continue;
            MissingElement missing;
            bool written = true;
            switch (item.kind) {
            case ItemKind::clock:
                written = false;
                missing = applyClock(ctx, written);
                break;
            case ItemKind::option:
                writeOption(session, item.option, deviceCfg, status, outcome);
                break;
            case ItemKind::devInit:
                applyDevInit(ctx);
                break;
            case ItemKind::insulins:
                missing = applyInsulins(ctx);
                break;
            case ItemKind::pills:
                missing = applyOralMeds(ctx);
                break;
            case ItemKind::schedule:
                missing = applySchedule(ctx);
                break;
            case ItemKind::targets:
                missing = applyTargets(ctx);
                break;
            case ItemKind::glucRange:
            case ItemKind::glucErrRange:
            case ItemKind::glucCalib:
                continue;  // read only: never wanted
            }
            // The writes made so far stay made; the refusals gathered so far are told too.
            if (missing)
                return invalidXml(" ;" + *missing + " missing in Device settings" +
                                  (outcome.strError.empty() ? "" : ";" + outcome.strError));
            if (!written) continue;
            progress.advance(req.owner);
        }
    }
    return true;
}

// The one summary of the writes: partial success, failure or success.
void reportOutcome(Request& req, const WriteOutcome& outcome) {
    if (outcome.bFailure && outcome.bSuccess)
        req.report(ME_PARTIALSUCCESS, ME_PARTIALSUCCESS, ErrorDescription(ME_PARTIALSUCCESS) + ";" + outcome.strError);
    else if (outcome.bFailure)
        req.report(ME_FAIL, ME_FAIL, ErrorDescription(ME_FAIL) + ";" + outcome.strError);
    else
        req.report(ME_SUCCESS, ME_SUCCESS, ErrorDescription(ME_SUCCESS));
}

}  // namespace

std::int32_t setDeviceSettings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                               XMLWrapper& deviceCfg, XMLWrapper& status) {
    // Traced under the name of the request it shares its handler with.
    Request req(owner, "getDeviceSettings", udtMeterRec, &status);
    return req.run([&]() -> std::int32_t {
        Claims claims;
        claims.port = Request::portText(deviceInfo);
        req.ensureSession();
        if (!validate(req, deviceInfo, deviceCfg, claims)) return req.complete(ME_FAIL);
        if (!identify(req, udtMeterRec, claims)) return req.complete(ME_FAIL);
        WriteOutcome outcome;
        if (!apply(req, deviceCfg, status, outcome)) return req.complete(ME_FAIL);
        reportOutcome(req, outcome);
        status.MoveToRoot();
        return req.complete(ME_SUCCESS);
    });
}

}  // namespace varnel::detail
