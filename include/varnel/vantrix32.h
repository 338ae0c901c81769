/*
 * The meter transport library: every meter input and output of the
 * component goes through these functions. Varnel ships a library with this
 * interface that simulates the meters (libvantrix32); another library with
 * the same exported names can be used in its place.
 *
 * The functions, their arguments and how each argument crosses the boundary
 * are listed in vantrix32_functions.h; this header declares every one of them
 * from that list, for example
 *
 *   int16_t VX_CALL find_meter(METER_REC* rec, int32_t found[11], int16_t ports[11]);
 *   int16_t VX_CALL vb_Set_Meter_Option(METER_REC* rec, int16_t option, int16_t value);
 *   void VX_CALL vx_set_clock_hook(vx_tick_fn tick_count, vx_sleep_fn sleep, void* context);
 *
 * Each meter function returns 0 for success or a negative ReturnValues_Enum
 * code, and then also sets Error_code in the record it was passed
 * (convert_to_seconds returns seconds instead). The two hook setters are
 * optional: a library without them is used without yielding, on its own clock.
 */
#ifndef VARNEL_VANTRIX32_H
#define VARNEL_VANTRIX32_H

#include <stdint.h>

#include "records.h"
#include "vantrix32_functions.h"

#if defined(VANTRIX32_BUILDING) && defined(_WIN32)
#define VX_API __declspec(dllexport)
#elif defined(VANTRIX32_BUILDING)
#define VX_API __attribute__((visibility("default")))
#else
#define VX_API
#endif

/* 32-bit Windows transports use the standard-call convention, exported by
 * their undecorated names; elsewhere the platform's only C convention. */
#if defined(_WIN32) && defined(__i386__)
#define VX_CALL __stdcall
#else
#define VX_CALL
#endif

#ifdef __cplusplus
extern "C" {
#endif

#define VX_DECLARE_(ret, name, ...) VX_API ret VX_CALL name(VX_C_PARAMS(__VA_ARGS__));
VX_TRANSPORT_FUNCTIONS(VX_DECLARE_)
#undef VX_DECLARE_

#ifdef __cplusplus
}
#endif

#endif /* VARNEL_VANTRIX32_H */
