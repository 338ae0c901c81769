/* A transport library for the loading tests, generated from the function list:
 * every function records its name and each argument (numbers by value, objects
 * and lists by address), fills what it is given to fill with 0x5A bytes and
 * returns its own code: -101 for the first function of the list, -102 for the
 * next, and so on. */
#include <string.h>

#include "varnel/vantrix32.h"

#define EXPORT VX_API

/* A library lacking a required function exports it under another name. */
#ifdef RECORDING_TRANSPORT_NO_CHK4METER_VARIANT
#define vb_Chk4Meter withheld_vb_Chk4Meter
#endif

/* What the last call recorded, for the tests to read. */
EXPORT const char* last_name = "";
EXPORT intptr_t last_args[6];
EXPORT int last_count;

static vx_yield_fn yield_hook = 0;
static void* yield_context = 0;
static vx_tick_fn tick_hook = 0;
static vx_sleep_fn sleep_hook = 0;
static void* clock_context = 0;

static const char* const names[] = {
#define NAME(ret, name, ...) #name,
    VX_METER_FUNCTIONS(NAME)
#undef NAME
};

static void start(void) {
    memset(last_args, 0, sizeof last_args);
    last_count = 0;
}

static void keep(intptr_t arg) { last_args[last_count++] = arg; }

static int16_t finish(const char* name) {
    int16_t code = -101;
    while (strcmp(names[-101 - code], name) != 0) --code;
    last_name = name;
    return code;
}

/* The long operation: lets the caller's messages run twice on the way. */
static void long_operation(METER_REC* rec) {
    rec->Percent_done = 50;
    if (yield_hook) yield_hook(yield_context);
    rec->Percent_done = 100;
    if (yield_hook) yield_hook(yield_context);
}

#define RECORD(kind, type, name) RECORD_##kind(type, name);
#define RECORD_REC(type, name) keep((intptr_t)name), rec_seen = name
#define RECORD_VALUE(type, name) keep((intptr_t)name)
#define RECORD_IN(type, name) keep((intptr_t)name)
#define RECORD_INOUT(type, name) keep((intptr_t)name)
#define RECORD_OUT(type, name) keep((intptr_t)name), memset(name, 0x5A, sizeof *name)
#define RECORD_IN_LIST(type, name) keep((intptr_t)name)
#define RECORD_OUT_LIST(type, name) keep((intptr_t)name), memset(name, 0x5A, VX_LIST_LENGTH * sizeof *name)

#define DEFINE(ret, name, ...)                                                                  \
    EXPORT ret VX_CALL name(VX_C_PARAMS(__VA_ARGS__)) {                                         \
        METER_REC* rec_seen = 0;                                                                \
        start();                                                                                \
        VX_EACH(RECORD, __VA_ARGS__)                                                            \
        if (rec_seen && strcmp(#name, "vb_Clear_Meter_Datalog") == 0) long_operation(rec_seen); \
        return finish(#name);                                                                   \
    }
VX_METER_FUNCTIONS(DEFINE)

#ifndef RECORDING_TRANSPORT_NO_HOOKS_VARIANT
EXPORT void VX_CALL vx_set_yield_hook(vx_yield_fn hook, void* context) {
    yield_hook = hook;
    yield_context = context;
}

EXPORT void VX_CALL vx_set_clock_hook(vx_tick_fn tick_count, vx_sleep_fn sleep, void* context) {
    tick_hook = tick_count;
    sleep_hook = sleep;
    clock_context = context;
}
#endif

/* The caller's time as the library sees it (0 without a clock hook), and a wait on it. */
EXPORT uint32_t library_now(void) { return tick_hook ? tick_hook(clock_context) : 0; }
EXPORT void library_sleep(uint32_t ms) {
    if (sleep_hook) sleep_hook(clock_context, ms);
}
