// The real clock and the per-thread clock slot. A transport library gets this
// clock through its clock hook, never by linking the component.
#include "varnel/clock.h"

#include "platform/message_pump.h"
#include "platform/native.h"

namespace varnel {

Clock::~Clock() = default;

namespace {

// The system's tick count and sleep (GetTickCount on Windows).
class SystemClock final : public Clock {
public:
    std::uint32_t tickCount() override { return detail::native::tickCount(); }
    void sleep(std::uint32_t ms) override { detail::native::sleep(ms); }
};

thread_local std::shared_ptr<Clock> t_clock;

SystemClock& systemClock() {
    static SystemClock clock;
    return clock;
}

}  // namespace

void setThreadClock(std::shared_ptr<Clock> clock) { t_clock = std::move(clock); }

Clock& threadClock() { return t_clock ? *t_clock : systemClock(); }

bool detail::onSystemQueue() { return !t_clock && native::hasMessageQueue(); }

}  // namespace varnel
