// Device discovery, and the device description block that discovery and the
// get-requests write into their documents.
#pragma once

#include <cstdint>
#include <string>

#include "requests/request_context.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// A firmware text "version mm/dd/yy" taken apart; date parts are "" when unknown.
struct FirmwareText {
    std::string version;
    std::string month;
    std::string day;
    std::string year;  // four digits, or "" when the two-digit year is not 0-99
};

// Splits a firmware text; one without two "/" after its first blank raises an error.
FirmwareText splitFirmware(const std::string& firmware);

// The model display name of a meter type ("Old Meter" for any unknown one).
const char* meterDisplayName(std::int32_t meterType);

// A part of the meter's identity the session could not read: the read's code
// (0 when everything was read) and the context of its report.
struct IdentityFailure {
    std::int16_t code = 0;
    const char* context = "";
    explicit operator bool() const { return code != 0; }
};

// The first part of the identity that the session's last find or init could not read.
IdentityFailure identityFailure(const MeterDll& session);

// Selects DeviceInfo and appends SN, MasterSWVer, Name, TypeID, Class and
// CommState of the session's meter; DeviceInfo stays current. When part of
// the identity could not be read nothing is written and the failure is given
// back for the caller to report.
IdentityFailure writeDeviceDescription(XMLWrapper& doc, MeterDll& session);

// Looks for a meter on the first port of the connection document and describes it.
std::int32_t discoverDevice(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& connInfo,
                            XMLWrapper& status);

}  // namespace varnel::detail
