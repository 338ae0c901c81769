// Error propagation: each routine's handler adds its name to one shared
// routine trace and raises the error again, so the public request can report
// the whole chain.
#pragma once

#include <cstdint>
#include <string>
#include <type_traits>
#include <utility>

#include "varnel/component_error.h"

namespace varnel::detail {

// One error: the latest number, description, line and routine, and the trace.
struct IError {
    std::int32_t ErrorNo = 0;
    std::string ErrorDesc;
    std::string ErrorTrace;  // outermost routine first, each followed by " --> "
    std::string Reason;      // the description the error first arose with (ErrorDesc becomes the trace)
    std::string FunctionName;
    std::int32_t ErrLine = 0;
};

// The builder of the shared IError; one per thread.
class ErrPropagator {
public:
    std::string ClassName;
    std::string FunctionName;

    // Fills the shared IError with the error and prefixes FunctionName to its trace.
    IError& getError(std::int32_t errorNo, const std::string& errorDesc, std::int32_t line = 0);
    // Starts the trace afresh; every public request calls it on entry.
    void reset();
    IError& error() { return error_; }

private:
    IError error_;
};

// The calling thread's builder.
ErrPropagator& errPropagator();

// Number, description and line of the exception being handled (call inside a catch).
struct CaughtError {
    std::int32_t number;
    std::string description;
    std::int32_t line;
};
CaughtError currentError();

// What a client reads of an error that left a public request: the routine
// trace, ending with the reason the error first arose with. Only an error
// raised through the handler protocol has its reason in the shared error; any
// other is its own text.
std::string clientErrorText(const CaughtError& caught);

// The handler protocol in one place: records className/routine, runs the
// routine's clean-up with the error, and raises ComponentError(number, trace).
[[noreturn]] void propagateCurrent(const char* className, const char* routine,
                                   void (*cleanup)(void*, const IError&) = nullptr, void* cleanupContext = nullptr);

// Runs body under the handler protocol of className/routine.
template <class F>
decltype(auto) guarded(const char* className, const char* routine, F&& body) {
    try {
        return std::forward<F>(body)();
    } catch (...) {
        propagateCurrent(className, routine);
    }
}

// Runs body under the handler protocol; cleanup(const IError&) runs before the error is raised again.
template <class F, class C>
decltype(auto) guarded(const char* className, const char* routine, F&& body, C&& cleanup) {
    try {
        return std::forward<F>(body)();
    } catch (...) {
        using Cleanup = std::remove_reference_t<C>;
        propagateCurrent(
            className, routine, [](void* ctx, const IError& e) { (*static_cast<Cleanup*>(ctx))(e); },
            const_cast<void*>(static_cast<const void*>(&cleanup)));
    }
}

// Raises an error of the component's own (a subscript, an overflow, a missing object).
[[noreturn]] void raise(std::int32_t number, const std::string& description);

// The value as a 16-bit integer, or an overflow error.
std::int16_t toInt16(long long value);
// Rounds to the nearest 16-bit integer, halves to even, or raises an overflow error.
std::int16_t roundToInt16(double value);
// Rounds to the nearest 32-bit integer, halves to even, or raises an overflow error.
std::int32_t roundToInt32(double value);

}  // namespace varnel::detail
