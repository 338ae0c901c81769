#include "requests/discovery.h"

#include <charconv>
#include <cmath>
#include <cstdio>
#include <string_view>

#include "errors/err_propagator.h"
#include "requests/document_values.h"
#include "requests/request_frame.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kDisplayNames[] = {
    "Old Meter",
    "Corvia(R) Tarn",
    "Corvia(R) Pellis(R)",
    "Corvia(R) Dunmark(R), Corvia(R) Harvel(R), Corvia(R) Dunmark(R) Plus",
    "Corvia(R) Quilla(R), Ostrel(TM), Bremo(R), Vimmet(R)",
    "Corvia(R) TOLVO(TM), Corvia(R) TOLVO(TM) Plus",
    "Corvia(R) Zenta(TM)",
    "Corvia(R) Morvex(TM)",
    "Parvix(R)",
};

constexpr int kFirmwareBytes = 20;
constexpr double kPortLimit = 256;

// Text up to the next "/" of rest, which then starts after it.
std::string takeDatePart(std::string_view& rest, const std::string& firmware) {
    const auto slash = rest.find('/');
    if (slash == std::string_view::npos)
        raise(errc::internal, "The firmware text \"" + firmware + "\" has no month/day/year date");
    std::string part = Trim(rest.substr(0, slash));
    rest.remove_prefix(slash + 1);
    return part;
}

// Meters that are switched off while they talk to the computer.
bool talksWhileOff(std::int16_t meterType) { return meterType == 4 || meterType == 6 || meterType == 8; }

}  // namespace

FirmwareText splitFirmware(const std::string& firmware) {
    FirmwareText out;
    const auto blank = firmware.find(' ');
    out.version = firmware.substr(0, blank);
    std::string_view rest(firmware);
    if (blank != std::string::npos) rest.remove_prefix(blank + 1);
    const std::string month = takeDatePart(rest, firmware);
    out.day = takeDatePart(rest, firmware);
    const std::string year = Trim(rest);
    if (!year.empty()) {
        const double y = ToNumber(year);
        // Two-digit years: the oldest firmware dates from the 1990s, so 90-99 are those and the rest 2000s.
        // The century is added to the number, not the text, so "3" is 2003 and a fraction is no year.
        if (y >= 0 && y <= 99 && y == std::floor(y))
            out.year = std::to_string((y >= 90 ? 1900 : 2000) + static_cast<int>(y));
    }
    if (!month.empty()) out.month = TwoDigits(std::llround(ToNumber(month)));
    return out;
}

const char* meterDisplayName(std::int32_t meterType) {
    if (!IsMeterType(meterType)) return kDisplayNames[0];
    return kDisplayNames[meterType];
}

IdentityFailure identityFailure(const MeterDll& session) {
    if (const std::int16_t code = session.SerialCode()) return {code, " ; Serial number read failed"};
    if (const std::int16_t code = session.FirmwareCode()) return {code, " ; Firmware read failed"};
    return {};
}

IdentityFailure writeDeviceDescription(XMLWrapper& doc, MeterDll& session) {
    if (const IdentityFailure failure = identityFailure(session)) return failure;
    const METER_REC stored = session.storedRecord();
    doc.SelectElement("DeviceInfo");
    doc.AddElement("SN", session.LastMeterSerialNo());
    const FirmwareText fw = splitFirmware(BytesToText(stored.Firmware_number, kFirmwareBytes));
    doc.AddElement("MasterSWVer", fw.version);
    if (!fw.day.empty() && !fw.month.empty() && !fw.year.empty()) {
        doc.SetAttribute("D", fw.day);
        doc.SetAttribute("MM", fw.month);
        doc.SetAttribute("Y", fw.year);
    }
    doc.AddElement("Name", meterDisplayName(session.LastMeterType()));
    doc.AddElement("TypeID", std::to_string(session.LastMeterType()));
    doc.AddElement("Class", "0");
    doc.SetAttribute("Txt", "Glucose Meter");
    const bool off = talksWhileOff(stored.M_Type);
    doc.AddElement("CommState", off ? "0" : "1");
    doc.SetAttribute("Txt", off ? "Off" : "On");
    return {};
}

std::int32_t discoverDevice(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& connInfo,
                            XMLWrapper& status) {
    Request req(owner, "discoverDevice", udtMeterRec, &status);
    return req.run([&]() -> std::int32_t {
        req.ensureSession();

        connInfo.SelectElement("Ports");
        const std::string kind = connInfo.GetChildName(connInfo.GetChildCount() - 1);
        if (!EqualsNoCase(kind, "COM")) {
            req.report(ME_NOT_SUPPORTED, ME_UNSUPPORTED_PORTS, kind + " is Unsupported");
            return ME_UNSUPPORTED_PORTS;
        }
        connInfo.MoveToChild(kind);
        const std::string ports = connInfo.GetChildValue("PortsToSearch");

        // Only the first port of a list is searched.
        const auto comma = ports.find(',');
        const double port = ToNumber(comma == std::string::npos ? ports : ports.substr(0, comma));
        if (!(port >= 0 && port < kPortLimit)) {
            req.report(ME_FAIL, ME_INVALID_XMLWRAPPOBJ, ports + " is not a valid port");
            return ME_INVALID_XMLWRAPPOBJ;
        }
        req.session.setCOMPort_Pref(roundToInt16(port));

        // Finding may upload (a meter that tells its serial number no other way); an earlier
        // failed search must not make that upload a silent no-op.
        SetContinueFlag(true);
        const std::int16_t found = req.session.findmeter(udtMeterRec);
        if (found != 0) {
            const std::string searched = comma == std::string::npos ? ports : NumberText(port);
            req.fail(req.session.LastError(), " ; No meter detected on port " + searched);
            SetContinueFlag(false);
            req.session.transport().initialize_meter_structure(udtMeterRec);
            return found;
        }

        // A meter whose identity could not be read in full is not described with made-up parts.
        SetContinueFlag(true);
        if (const IdentityFailure failure = writeDeviceDescription(deviceInfo, req.session)) {
            req.fail(failure.code, failure.context);
            return failure.code;
        }
        deviceInfo.SelectElement("PortInfo");
        deviceInfo.AddElement("PortID", std::to_string(req.session.COMPort_Detected()));
        deviceInfo.AddElement("PortType", "0");
        deviceInfo.SetAttribute("Txt", "Serial");
        deviceInfo.MoveToRoot();
        return ME_SUCCESS;
    });
}

}  // namespace varnel::detail
