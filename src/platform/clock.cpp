// The real clock and the per-thread clock slot. A transport library gets this
// clock through its clock hook, never by linking the component.
#include "varnel/clock.h"

#include <chrono>
#include <thread>

namespace varnel {

Clock::~Clock() = default;

namespace {

class SteadyClock final : public Clock {
public:
    std::uint32_t tickCount() override {
        using namespace std::chrono;
        auto ms = duration_cast<milliseconds>(steady_clock::now().time_since_epoch()).count();
        return static_cast<std::uint32_t>(ms);
    }
    void sleep(std::uint32_t ms) override { std::this_thread::sleep_for(std::chrono::milliseconds(ms)); }
};

thread_local std::shared_ptr<Clock> t_clock;

}  // namespace

void setThreadClock(std::shared_ptr<Clock> clock) { t_clock = std::move(clock); }

Clock& threadClock() {
    static SteadyClock steady;
    return t_clock ? *t_clock : steady;
}

}  // namespace varnel
