#include "requests/request_frame.h"

#include <algorithm>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

// An Error_code the client sets to keep the meter open on failure paths.
constexpr std::int16_t kKeepSessionOpen = -50;

}  // namespace

void reportStatus(XMLWrapper& status, std::int32_t major, std::int32_t minor, const std::string& description) {
    status.AddElement("ErrCode");
    status.AddChildElement("Major", "", std::to_string(major));
    status.AddChildElement("Minor", "", std::to_string(minor));
    status.AddElement("ErrDesc", description);
}

std::int16_t GetAllGeneralSettings(MeterDll& session, METER_REC& udtMeterRec, XMLWrapper& status,
                                   std::string& strError) {
    const std::int16_t r = session.transport().vb_Read_Meter_Options(udtMeterRec);
    if (r != 0) {
        strError = ErrorDescription(ME_FAIL) + ";" + strError + " ;" +
                   " GetAllGeneralSettings failed. Error is : " + ErrorDescription(r);
        reportStatus(status, ME_FAIL, r, strError);
    }
    return r;
}

Request::Request(RequestContext& owner, const char* traceName, METER_REC& udtMeterRec, XMLWrapper* status)
    : owner(owner), session(owner.session), rec(udtMeterRec), traceName_(traceName), status_(status) {
    errPropagator().reset();
}

void Request::ensureSession() {
    if (!session.isInitialised()) session.initialise();
}

bool Request::readPort(XMLWrapper& deviceInfo) {
    return usePort(portText(deviceInfo), ME_FAIL, " ; Port number from XML file is invalid");
}

std::string Request::portText(XMLWrapper& deviceInfo) {
    deviceInfo.SelectElement("PortInfo");
    return deviceInfo.GetChildValue("PortID");
}

bool Request::usePort(const std::string& text, std::int32_t major, const char* context) {
    const double port = ToNumber(text);
    if (port < 0) {
        report(major, ME_BAD_PARAMETER, ErrorDescription(ME_BAD_PARAMETER) + context);
        return false;
    }
    session.setCOMPort_Pref(roundToInt16(port));
    return true;
}

bool Request::readIdentity(XMLWrapper& deviceInfo) {
    deviceInfo.SelectElement("DeviceInfo");
    serialNumber_ = deviceInfo.GetChildValue("SN");
    if (serialNumber_.empty()) {
        fail(ME_BAD_PARAMETER, " ; Device SN from Device Info XML is invalid");
        return false;
    }
    typeText_ = deviceInfo.GetChildValue("TypeID");
    deviceInfo.MoveToRoot();
    if (!validType(typeText_)) {
        fail(ME_BAD_PARAMETER, " ; Device Type from Device Info XML is invalid");
        return false;
    }
    return true;
}

std::int32_t Request::checkMeter() {
    const std::int32_t c = session.checkmeter(rec);
    if (c != 0) fail(c);
    return c;
}

std::int32_t Request::compareIdentity() {
    if (!sameSerial(serialNumber_, "Device Info XML")) return ME_DIFFERENT_DEVICE;
    // The document says which check failed; the result stays a plain failure.
    if (!sameType(typeText_, "Device Info XML")) return ME_FAIL;
    return 0;
}

bool Request::sameSerial(const std::string& claimed, const char* source) {
    const std::string& meter = session.LastMeterSerialNo();
    if (EqualsNoCase(meter, claimed)) return true;
    report(ME_DIFFERENT_DEVICE, ME_DIFFERENT_DEVICE,
           ErrorDescription(ME_DIFFERENT_DEVICE) + " ; Device SN from " + source + " - " + claimed +
               " Device SN from device - " + meter + " do not match");
    return false;
}

bool Request::sameType(const std::string& claimed, const char* source) {
    const std::int16_t type = session.storedRecord().M_Type;
    if (ToNumber(claimed) == type) return true;
    report(ME_DIFFERENT_DEVICE, ME_DIFFERENT_DEVICE,
           ErrorDescription(ME_DIFFERENT_DEVICE) + " ; Device Type from " + source + " - " + claimed +
               " Device Type from device - " + std::to_string(type) + " do not match");
    return false;
}

bool Request::validType(const std::string& text) { return IsMeterType(ToNumber(text)); }

void Request::fail(std::int32_t code, const std::string& context) {
    report(ME_FAIL, code, ErrorDescription(code) + context);
}

void Request::report(std::int32_t major, std::int32_t minor, const std::string& description) {
    if (status_) reportStatus(*status_, major, minor, description);
}

void Request::close() {
    if (rec.Error_code != kKeepSessionOpen) session.MeterClose(rec);
}

std::int32_t Request::complete(std::int32_t result) {
    owner.raiseComplete();
    return result;
}

void Request::unexpected() {
    const CaughtError caught = currentError();
    ErrPropagator& propagator = errPropagator();
    propagator.ClassName = "DllWrapper";
    propagator.FunctionName = traceName_;
    // A copy: closing below may fail and write to the shared error.
    const IError e = propagator.getError(caught.number, caught.description, caught.line);
    // What the client hears about is the first error; later ones on this path are dropped.
    try {
        if (!status_)
            session.MeterClose(rec);
        else
            close();
    } catch (...) {}
    if (status_) {
        try {
            reportStatus(*status_, ME_FAIL, ME_UNKNOWN,
                         ErrorDescription(ME_UNKNOWN) + ";Error number = " + std::to_string(e.ErrorNo) +
                             " Error description = " + e.ErrorDesc);
            status_->AddElement("VBTrace", std::to_string(e.ErrLine));
        } catch (...) {}
    }
    owner.raiseComplete();
    throw ComponentError(e.ErrorNo, e.ErrorTrace, e.ErrLine);
}

ItemProgress::ItemProgress(std::int32_t count) : step_(count > 0 ? roundToInt16(100.0 / count) : std::int16_t{0}) {}

void ItemProgress::advance(RequestContext& owner) {
    percent_ = static_cast<std::int16_t>(std::min(percent_ + step_, 100));
    owner.RaiseProgress(percent_);
}

}  // namespace varnel::detail
