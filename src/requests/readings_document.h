// The readings request: uploads a meter's memory into a datalog document.
#pragma once

#include <cstdint>

#include "requests/request_context.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// Writes the device section, the transfer summary and one entry per reading; the filter is not read.
std::int32_t getReadings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& datalog,
                         XMLWrapper& filter, XMLWrapper& status, bool& blnCheckMeter);

}  // namespace varnel::detail
