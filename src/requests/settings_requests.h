// The settings requests: reading and writing a meter's settings and describing its capabilities.
#pragma once

#include <cstdint>

#include "requests/request_context.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

std::int32_t setDeviceSettings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                               XMLWrapper& deviceCfg, XMLWrapper& status);
std::int32_t getDeviceSettings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                               XMLWrapper& deviceCfg, bool blnFetchAllInfo, XMLWrapper& status, bool& blnCheckMeter);
std::int32_t getDeviceCaps(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo,
                           XMLWrapper& deviceCaps, bool blnFetchAllInfo, XMLWrapper& status, bool& blnCheckMeter);

}  // namespace varnel::detail
