// The yield hook: the caller's message pump, run between chunks of long operations.
#include "varnel/vantrix32.h"

namespace {
thread_local void (*t_hook)(void*) = nullptr;
thread_local void* t_context = nullptr;
}  // namespace

extern "C" void vx_set_yield_hook(void (*hook)(void* context), void* context) {
    t_hook = hook;
    t_context = context;
}

namespace varnel::sim {
void yieldToCaller() {
    if (t_hook) t_hook(t_context);
}
}  // namespace varnel::sim
