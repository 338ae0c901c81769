// The session's general-option writers: each takes one value from the
// "Settings" of a device configuration document, checks it and writes it to
// the meter with a single-option write.
#pragma once

#include <cstdint>
#include <string>

#include "session/meter_dll.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// What a run of writes has come to. Refusals set bFailure and append their
// message to strError, writes that reached the meter set bSuccess; neither
// flag is ever cleared and nothing is removed from strError.
struct WriteOutcome {
    bool bFailure = false;
    bool bSuccess = false;
    std::string strError;

    void refuse(const std::string& message) {
        bFailure = true;
        strError += message;
    }
};

// Name of the option's writer in the routine trace ("SetStripCalCode" ...).
const char* optionWriterName(MeterOptions_Enum option);

// Writes the option from the configuration document's "Settings" (left as its
// current element): 0 when the meter took it, the transport's code when the
// meter refused it, ME_FAIL when the value was refused here. Unexpected
// errors pass up with the writer's name, class "MeterDll"; the prompt and
// week-start writers first note themselves in the status document.
std::int16_t writeOption(MeterDll& session, MeterOptions_Enum option, XMLWrapper& deviceCfg, XMLWrapper& status,
                         WriteOutcome& outcome);

}  // namespace varnel::detail
