// The requests that act on the meter itself: erasing its memory and releasing it.
#pragma once

#include <cstdint>

#include "requests/request_context.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// Erases the meter the device information describes, in one progress stage of 0-100.
std::int32_t clearMeter(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& status);
// Releases the meter; reports nothing, the session's code on failure.
std::int32_t closeMeter(RequestContext& owner, METER_REC& udtMeterRec);

}  // namespace varnel::detail
