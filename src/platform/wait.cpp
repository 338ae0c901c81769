#include "platform/wait.h"

#include <limits>
#include <optional>
#include <vector>

#include "errors/err_propagator.h"
#include "platform/message_pump.h"
#include "platform/native.h"
#include "varnel/clock.h"

namespace varnel::detail {

WaitEvent::WaitEvent() : handle_(native::createEvent()) {}

WaitEvent::~WaitEvent() { native::closeEvent(handle_); }

void WaitEvent::pulse() {
    ++pulses_;
    native::pulseEvent(handle_);
}

namespace {

// One round of a wait on the system's message queue: the events, a message,
// a tick scheduled on the clock or the time left, whichever comes first.
std::int32_t systemRound(std::span<void* const> handles, std::int32_t remaining, bool limited,
                         std::optional<std::uint32_t> tick) {
    const auto count = static_cast<std::int32_t>(handles.size());
    const bool tickFirst = tick && (!limited || *tick <= static_cast<std::uint32_t>(remaining));
    const std::int32_t ms = tickFirst ? static_cast<std::int32_t>(*tick) : remaining;
    const std::int32_t result = native::waitEventsOrMessage(handles, ms);
    if (result >= 0) return result;
    return result == native::messageArrived || tickFirst ? count : waitTimeout;
}

}  // namespace

void clsWait::SuspendProcessing() {
    WaitEvent* self = &event_;
    MsgWaitObj(noTimeLimit, {&self, 1});
}

void clsWait::SleepForSeconds(double seconds) {
    // A negative time would round to -1 ("no limit") or wrap; it has simply passed.
    WaitEvent* self = &event_;
    MsgWaitObj(seconds < 0 ? 0 : roundToInt32(seconds * 1000.0), {&self, 1});
}

void clsWait::ResumeProcessing() {
    event_.pulse();
    doEvents();
}

std::int32_t clsWait::MsgWaitObj(std::int32_t interval, std::span<WaitEvent* const> objects) {
    Clock& clock = threadClock();
    const auto count = static_cast<std::int32_t>(objects.size());
    std::vector<std::uint64_t> seen;
    std::vector<void*> handles;
    for (const WaitEvent* object : objects) {
        seen.push_back(object->pulses());
        handles.push_back(object->handle());
    }
    const bool system = onSystemQueue();

    const bool limited = interval != noTimeLimit;
    // Tick counts wrap at 2^32; unsigned arithmetic gives the wrapped end directly.
    const std::uint32_t end = clock.tickCount() + static_cast<std::uint32_t>(interval);
    for (;;) {
        std::int32_t remaining = noTimeLimit;
        if (limited) {
            remaining = static_cast<std::int32_t>(end - clock.tickCount());
            // Negative: the end has passed. More than was asked for: the tick count went back. Both end the wait.
            if (remaining < 0 || remaining > interval) return waitTimeout;
        }

        std::int32_t status;
        const auto tick = msUntilNextTick();
        if (system) {
            // Another thread may pulse a kernel event; with none, nothing could release the wait.
            if (!limited && objects.empty() && !tick && !windowTickComing()) return waitTimeout;
            status = systemRound(handles, remaining, limited, tick);
        } else if (tick && (!limited || *tick <= static_cast<std::uint32_t>(remaining))) {
            clock.sleep(*tick);
            status = count;  // a message, not an object, ended this round
        } else if (limited) {
            clock.sleep(static_cast<std::uint32_t>(remaining));
            status = waitTimeout;
        } else {
            return waitTimeout;  // nothing left that could release the wait
        }

        doEvents();
        for (std::int32_t i = 0; i < count; ++i)
            if (objects[static_cast<std::size_t>(i)]->pulses() != seen[static_cast<std::size_t>(i)]) return i;
        if (status != count) return status;
    }
}

void WaitSeconds(float seconds, bool) {
    const double ms = static_cast<double>(seconds) * 1000.0;
    if (!(ms <= std::numeric_limits<std::int32_t>::max())) return;  // NaN too
    thread_local clsWait shared;
    shared.SleepForSeconds(seconds);
}

}  // namespace varnel::detail
