// The steps of setDeviceSettings that write one settings group each, from the
// "Settings" element of a device configuration document.
#pragma once

#include <optional>
#include <string>

#include "readings/meter_models.h"
#include "requests/option_writers.h"
#include "session/meter_dll.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// What a write step works on.
struct ApplyContext {
    MeterDll& session;
    MeterModel& meter;
    XMLWrapper& deviceCfg;
    WriteOutcome& outcome;
};

// The element a step found missing or doubled, which ends the request; nothing
// when the step ran to its end. Value refusals only go into the outcome.
using MissingElement = std::optional<std::string>;

// Each fills its group from the document and saves it once; a model without
// the group makes the step do nothing.
MissingElement applyInsulins(ApplyContext& ctx);
MissingElement applyOralMeds(ApplyContext& ctx);
MissingElement applySchedule(ApplyContext& ctx);
MissingElement applyTargets(ApplyContext& ctx);

}  // namespace varnel::detail
