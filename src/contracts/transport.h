// The component's side of the transport contract: one member per function of
// the transport library's C interface, so a session can run on a loaded
// library, the statically linked simulator or a scripted fake.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "varnel/records.h"
#include "varnel/vantrix32.h"

namespace varnel::detail {

// Every function of the transport library, as pointers (a missing optional hook is nullptr).
struct TransportFunctions {
#define VARNEL_FUNCTION_POINTER(ret, name, ...) decltype(&::name) name;
    VX_TRANSPORT_FUNCTIONS(VARNEL_FUNCTION_POINTER)
#undef VARNEL_FUNCTION_POINTER
};

// A parameter as the component passes it: the record and single objects by reference.
#define VARNEL_CXX_PARAM(kind, type, name) , VARNEL_CXX_PARAM_##kind(type, name)
#define VARNEL_CXX_PARAM_REC(type, name) type& name
#define VARNEL_CXX_PARAM_VALUE(type, name) type name
#define VARNEL_CXX_PARAM_IN(type, name) type& name
#define VARNEL_CXX_PARAM_OUT(type, name) type& name
#define VARNEL_CXX_PARAM_INOUT(type, name) type& name
#define VARNEL_CXX_PARAM_IN_LIST(type, name) type name[VX_LIST_LENGTH]
#define VARNEL_CXX_PARAM_OUT_LIST(type, name) type name[VX_LIST_LENGTH]
#define VARNEL_CXX_PARAMS(...) VX_COMMA_LIST(VX_EACH(VARNEL_CXX_PARAM, __VA_ARGS__))

// The transport library as the component calls it: one member per meter function.
class Transport {
public:
    virtual ~Transport() = default;

#define VARNEL_TRANSPORT_MEMBER(ret, name, ...) virtual ret name(VARNEL_CXX_PARAMS(__VA_ARGS__)) = 0;
    VX_METER_FUNCTIONS(VARNEL_TRANSPORT_MEMBER)
#undef VARNEL_TRANSPORT_MEMBER
};

// A transport over a library loaded by path on first use; a missing library
// or function raises ComponentError naming it.
std::shared_ptr<Transport> loadTransport(const std::string& path);
// The same over the first of several paths that loads; the error names every path tried.
std::shared_ptr<Transport> loadTransport(std::vector<std::string> candidates);

// A transport over functions already in the process (the statically linked simulator).
std::shared_ptr<Transport> makeTransport(const TransportFunctions& functions);

// Hands the calling thread's clock to a transport library through its clock
// hook setter, so the library's waits run on a test's ManualClock too.
void lendThreadClock(decltype(&::vx_set_clock_hook) setClockHook);

}  // namespace varnel::detail
