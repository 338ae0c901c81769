#include "caller_hooks.h"

#include <chrono>
#include <thread>

namespace varnel::capture {

CallerHooks& callerHooks() {
    thread_local CallerHooks hooks;
    return hooks;
}

std::uint32_t callerTicks() {
    const CallerHooks& h = callerHooks();
    if (h.tick) return h.tick(h.clockContext);
    using namespace std::chrono;
    return static_cast<std::uint32_t>(duration_cast<milliseconds>(steady_clock::now().time_since_epoch()).count());
}

void callerSleep(std::uint32_t ms) {
    const CallerHooks& h = callerHooks();
    if (ms == 0) return;
    if (h.sleep)
        h.sleep(h.clockContext, ms);
    else
        std::this_thread::sleep_for(std::chrono::milliseconds(ms));
}

void callerYield() {
    const CallerHooks& h = callerHooks();
    if (h.yield) h.yield(h.yieldContext);
}

}  // namespace varnel::capture

// Both libraries take the caller's hooks the same way: both functions of the clock or neither.
extern "C" VX_API void vx_set_yield_hook(vx_yield_fn hook, void* context) {
    auto& h = varnel::capture::callerHooks();
    h.yield = hook;
    h.yieldContext = context;
    ++h.generation;
}

extern "C" VX_API void vx_set_clock_hook(vx_tick_fn tick_count, vx_sleep_fn sleep, void* context) {
    auto& h = varnel::capture::callerHooks();
    const bool whole = tick_count && sleep;
    h.tick = whole ? tick_count : nullptr;
    h.sleep = whole ? sleep : nullptr;
    h.clockContext = whole ? context : nullptr;
    ++h.generation;
}
