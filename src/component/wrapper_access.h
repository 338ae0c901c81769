// The internal way to run a DllWrapper on a transport already in the process:
// the statically linked simulator, a scripted fake, a table of functions.
// Clients supply a transport library by path instead.
#pragma once

#include <memory>

#include "contracts/transport.h"
#include "varnel/dll_wrapper.h"

namespace varnel::detail {

struct WrapperAccess {
    static DllWrapper over(std::shared_ptr<Transport> transport);
};

// A DllWrapper whose requests go to transport.
inline DllWrapper wrapperOver(std::shared_ptr<Transport> transport) {
    return WrapperAccess::over(std::move(transport));
}

}  // namespace varnel::detail
