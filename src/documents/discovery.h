// Device discovery, and the device description block that discovery and the
// get-requests write into their documents.
#pragma once

#include <cstdint>
#include <string>

#include "component/dll_impl.h"
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

// The context of a report for a meter whose firmware could not be read.
inline constexpr const char* kFirmwareFailed = " ; Firmware read failed";

// Selects DeviceInfo and appends SN, MasterSWVer, Name, TypeID, Class and
// CommState of the session's meter; DeviceInfo stays current. When the
// session's last firmware read failed nothing is written and its code is
// given back (the caller reports it); 0 otherwise.
std::int16_t writeDeviceDescription(XMLWrapper& doc, MeterDll& session);

// Looks for a meter on the first port of the connection document and describes it.
std::int32_t discoverDevice(DllWrapper::Impl& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                            XMLWrapper& connInfo, XMLWrapper& status);

}  // namespace varnel::detail
