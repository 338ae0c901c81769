// The hooks the caller handed to this library, kept per thread as the
// transport contract asks: its message pump and its clock.
#pragma once

#include <cstdint>

#include "varnel/vantrix32.h"

namespace varnel::capture {

struct CallerHooks {
    vx_yield_fn yield = nullptr;
    void* yieldContext = nullptr;
    vx_tick_fn tick = nullptr;
    vx_sleep_fn sleep = nullptr;
    void* clockContext = nullptr;
    // Bumped whenever a hook changes, so a forwarding library knows to hand them on.
    unsigned generation = 1;
};

CallerHooks& callerHooks();

// The caller's clock, else a steady clock of this library.
std::uint32_t callerTicks();
// Waits on the caller's clock, else for real.
void callerSleep(std::uint32_t ms);
void callerYield();

}  // namespace varnel::capture
