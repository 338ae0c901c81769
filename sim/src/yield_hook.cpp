// The caller's hooks: its message pump, run between chunks of long operations,
// and its clock, which the meter's time and wire time follow. Without a clock
// hook the library keeps its own steady clock and waits for real.
#include <chrono>
#include <thread>

#include "meter_state.h"
#include "varnel/vantrix32.h"

namespace {
thread_local void (*t_hook)(void*) = nullptr;
thread_local void* t_context = nullptr;

thread_local vx_tick_fn t_tick = nullptr;
thread_local vx_sleep_fn t_sleep = nullptr;
thread_local void* t_clockContext = nullptr;
}  // namespace

extern "C" void VX_CALL vx_set_yield_hook(vx_yield_fn hook, void* context) {
    t_hook = hook;
    t_context = context;
}

// Both functions or neither: a clock that can tell the time but not wait (or the reverse) is refused.
extern "C" void VX_CALL vx_set_clock_hook(vx_tick_fn tick_count, vx_sleep_fn sleep, void* context) {
    const bool whole = tick_count && sleep;
    t_tick = whole ? tick_count : nullptr;
    t_sleep = whole ? sleep : nullptr;
    t_clockContext = whole ? context : nullptr;
}

namespace varnel::sim {

void yieldToCaller() {
    if (t_hook) t_hook(t_context);
}

std::uint32_t callerTicks() {
    if (t_tick) return t_tick(t_clockContext);
    using namespace std::chrono;
    return static_cast<std::uint32_t>(duration_cast<milliseconds>(steady_clock::now().time_since_epoch()).count());
}

void callerSleep(std::uint32_t ms) {
    if (t_sleep)
        t_sleep(t_clockContext, ms);
    else
        std::this_thread::sleep_for(std::chrono::milliseconds(ms));
}

CallerClock callerClock() { return {t_tick, t_clockContext}; }

}  // namespace varnel::sim
