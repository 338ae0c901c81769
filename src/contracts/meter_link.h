// A meter session's record and the transport it is passed to: all a settings
// group takes from the session when it is initialised.
#pragma once

#include <memory>

#include "contracts/transport.h"
#include "varnel/records.h"

namespace varnel::detail {

struct MeterLink {
    // The session's meter record, passed to every transport call made with it.
    METER_REC MeterRec{};
    // The session's transport; settings groups initialised from this link use it too.
    std::shared_ptr<Transport> transport;
};

}  // namespace varnel::detail
