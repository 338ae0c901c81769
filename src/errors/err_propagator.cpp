#include "errors/err_propagator.h"

#include <cmath>
#include <limits>
#include <new>
#include <stdexcept>

namespace varnel::detail {

IError& ErrPropagator::getError(std::int32_t errorNo, const std::string& errorDesc, std::int32_t line) {
    // A handler further out sees the trace it raised as the description; only a new error has a reason.
    const bool raisedHere = !error_.ErrorTrace.empty() && errorDesc == error_.ErrorTrace;
    if (!raisedHere) error_.Reason = errorDesc;
    error_.ErrorNo = errorNo;
    error_.ErrorDesc = errorDesc;
    error_.ErrLine = line;
    error_.FunctionName = FunctionName;
    error_.ErrorTrace = FunctionName + " --> " + error_.ErrorTrace;
    // A transport that cannot be loaded is the one error the client cannot
    // act on without its reason (the path and the loader's message): the
    // trace carries it out to the client.
    if (!raisedHere && errorNo == errc::transport_unavailable) error_.ErrorTrace += errorDesc;
    return error_;
}

void ErrPropagator::reset() {
    ClassName.clear();
    FunctionName.clear();
    error_ = IError{};
}

ErrPropagator& errPropagator() {
    thread_local ErrPropagator propagator;
    return propagator;
}

CaughtError currentError() {
    try {
        throw;
    } catch (const ComponentError& e) {
        return {e.number(), e.description(), e.line()};
    } catch (const std::out_of_range& e) {
        return {errc::subscript_out_of_range, std::string("Subscript out of range: ") + e.what(), 0};
    } catch (const std::overflow_error& e) {
        return {errc::overflow, std::string("Overflow: ") + e.what(), 0};
    } catch (const std::bad_alloc&) {
        return {errc::internal, "Out of memory", 0};
    } catch (const std::exception& e) {
        return {errc::internal, e.what(), 0};
    } catch (...) {
        return {errc::internal, "Unknown failure", 0};
    }
}

std::string clientErrorText(const CaughtError& caught) {
    const IError& shared = errPropagator().error();
    std::string text = caught.description;
    if (caught.description != shared.ErrorTrace || shared.Reason.empty()) return text;
    if (!text.ends_with(shared.Reason)) text += shared.Reason;
    return text;
}

void propagateCurrent(const char* className, const char* routine, void (*cleanup)(void*, const IError&),
                      void* cleanupContext) {
    CaughtError caught = currentError();
    ErrPropagator& p = errPropagator();
    p.ClassName = className;
    p.FunctionName = routine;
    const IError& e = p.getError(caught.number, caught.description, caught.line);
    if (cleanup) cleanup(cleanupContext, e);
    throw ComponentError(e.ErrorNo, e.ErrorTrace, e.ErrLine);
}

void raise(std::int32_t number, const std::string& description) { throw ComponentError(number, description); }

std::int16_t toInt16(long long value) {
    if (value < std::numeric_limits<std::int16_t>::min() || value > std::numeric_limits<std::int16_t>::max())
        raise(errc::overflow, "Overflow");
    return static_cast<std::int16_t>(value);
}

namespace {

// The nearest integer of type T (halves to even), or the overflow error when T cannot hold it.
template <class T>
T roundChecked(double value) {
    if (!std::isfinite(value)) raise(errc::overflow, "Overflow");
    double r = std::nearbyint(value);
    if (r < std::numeric_limits<T>::min() || r > std::numeric_limits<T>::max()) raise(errc::overflow, "Overflow");
    return static_cast<T>(r);
}

}  // namespace

std::int16_t roundToInt16(double value) { return roundChecked<std::int16_t>(value); }

std::int32_t roundToInt32(double value) { return roundChecked<std::int32_t>(value); }

}  // namespace varnel::detail
