// The statically linked simulator as a transport, for tests that run whole requests.
#pragma once

#include <memory>

#include "contracts/transport.h"
#include "varnel/vantrix32.h"

namespace varnel::test {

// Every function of the simulator, for callers that replace a few of them.
inline detail::TransportFunctions simFunctions() {
    detail::TransportFunctions f{};
#define VARNEL_SIM_FUNCTION(ret, name, ...) f.name = &::name;
    VX_TRANSPORT_FUNCTIONS(VARNEL_SIM_FUNCTION)
#undef VARNEL_SIM_FUNCTION
    return f;
}

inline std::shared_ptr<detail::Transport> simTransport() { return detail::makeTransport(simFunctions()); }

}  // namespace varnel::test
