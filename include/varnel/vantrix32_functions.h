/*
 * The transport library's functions, each written down once. vantrix32.h
 * declares them from this list; loaders, forwarding tables, scripted fakes and
 * call recorders are generated from it too, so none of them can miss a
 * function or an argument.
 *
 * VX_METER_FUNCTIONS(F) expands F(return type, name, arguments...) for every
 * function a transport library must export, in a fixed order.
 * VX_HOOK_FUNCTIONS(F) does the same for the optional hooks a library may
 * export. Each argument is a tuple (kind, type, name); the kind says how it
 * crosses the boundary, which is what a fake or a recorder needs to know:
 *
 *   REC       the meter record (METER_REC*): read, and updated by every call
 *             (Error_code on failure, Percent_done during long operations)
 *   VALUE     a number (or hook) passed by value
 *   IN        one object by pointer that the library only reads
 *   OUT       one object by pointer that the library fills
 *   INOUT     one object by pointer that the library reads and changes
 *   IN_LIST   VX_LIST_LENGTH entries by pointer that the library only reads
 *   OUT_LIST  VX_LIST_LENGTH entries by pointer that the library fills
 *
 * The kinds are only ever token-pasted, never expanded.
 */
#ifndef VARNEL_VANTRIX32_FUNCTIONS_H
#define VARNEL_VANTRIX32_FUNCTIONS_H

#include <stdint.h>

#include "records.h"

/* Entries of a port list (find_meter). */
#define VX_LIST_LENGTH 11

/* The hooks a caller hands to a library, each called with the caller's context. */
typedef void (*vx_yield_fn)(void* context);
typedef uint32_t (*vx_tick_fn)(void* context);
typedef void (*vx_sleep_fn)(void* context, uint32_t ms);

/* clang-format off */
#define VX_METER_FUNCTIONS(F)                                                                    \
    /* Identification and session. */                                                          \
    F(int16_t, initialize_meter_structure, (REC, METER_REC, rec))                               \
    F(int16_t, find_meter, (REC, METER_REC, rec), (OUT_LIST, int32_t, found),                    \
      (IN_LIST, int16_t, ports))                                                                 \
    F(int16_t, initialize_meter_type_structure, (REC, METER_REC, rec), (VALUE, int16_t, type))  \
    F(int16_t, vb_Chk4Meter, (REC, METER_REC, rec))                                             \
    F(int16_t, vb_Get_Meter_Firmware, (REC, METER_REC, rec))                                    \
    F(int16_t, vb_Tickle_Meter, (REC, METER_REC, rec))                                          \
    F(int16_t, close_meter, (REC, METER_REC, rec))                                              \
    F(int16_t, vb_Clear_Meter_Datalog, (REC, METER_REC, rec))                                   \
    /* General options. */                                                                      \
    F(int16_t, vb_Read_Meter_Options, (REC, METER_REC, rec))                                    \
    F(int16_t, vb_Read_Meter_Option, (REC, METER_REC, rec), (VALUE, int16_t, option))           \
    F(int16_t, vb_Set_Meter_Option, (REC, METER_REC, rec), (VALUE, int16_t, option),            \
      (VALUE, int16_t, value))                                                                   \
    F(int16_t, vb_Set_Meter_Options, (REC, METER_REC, rec), (IN, SETTINGS_REC, settings))       \
    /* Clock, in transport seconds. */                                                          \
    F(int16_t, vb_Read_Meter_Clock, (REC, METER_REC, rec), (OUT, int32_t, seconds))             \
    F(int16_t, vb_Set_Meter_Clock, (REC, METER_REC, rec), (VALUE, int32_t, seconds))            \
    F(int32_t, convert_to_seconds, (IN, TIME_REC, time))                                        \
    F(int16_t, convert_from_seconds, (VALUE, int32_t, seconds), (OUT, TIME_REC, time))          \
    /* The meter's initialised flag. */                                                         \
    F(int16_t, GetInitializedFlag, (REC, METER_REC, rec), (OUT, int16_t, flag))                 \
    F(int16_t, SetInitializedFlag, (REC, METER_REC, rec), (VALUE, int16_t, flag))               \
    /* Medication names (read by index), favourites, meal schedule and targets. */              \
    F(int16_t, GetInsulinName, (REC, METER_REC, rec), (INOUT, INSULIN_OR_ORAL_MED_NAME_TYPE, name)) \
    F(int16_t, SetInsulinName, (REC, METER_REC, rec), (IN, INSULIN_OR_ORAL_MED_NAME_TYPE, name)) \
    F(int16_t, GetOralMedicationName, (REC, METER_REC, rec),                                    \
      (INOUT, INSULIN_OR_ORAL_MED_NAME_TYPE, name))                                              \
    F(int16_t, SetOralMedicationName, (REC, METER_REC, rec),                                    \
      (IN, INSULIN_OR_ORAL_MED_NAME_TYPE, name))                                                 \
    F(int16_t, GetPredefinedInsulins, (REC, METER_REC, rec), (OUT, PREDEFINED_INSULINS_TYPE, insulins)) \
    F(int16_t, SetPredefinedInsulins, (REC, METER_REC, rec), (IN, PREDEFINED_INSULINS_TYPE, insulins))  \
    F(int16_t, GetPredefinedOralMeds, (REC, METER_REC, rec), (OUT, PREDEFINED_ORAL_MEDS_TYPE, meds))    \
    F(int16_t, SetPredefinedOralMeds, (REC, METER_REC, rec), (IN, PREDEFINED_ORAL_MEDS_TYPE, meds))     \
    F(int16_t, GetMealSegments, (REC, METER_REC, rec), (OUT, MEAL_SEGMENTS_TYPE, segments))     \
    F(int16_t, SetMealSegments, (REC, METER_REC, rec), (IN, MEAL_SEGMENTS_TYPE, segments))      \
    F(int16_t, GetScheduleSelection, (REC, METER_REC, rec), (OUT, int16_t, selection))          \
    F(int16_t, SetScheduleSelection, (REC, METER_REC, rec), (VALUE, int16_t, selection))        \
    F(int16_t, GetTargetRange, (REC, METER_REC, rec), (OUT, int16_t, befLow),                   \
      (OUT, int16_t, befHigh), (OUT, int16_t, aftLow), (OUT, int16_t, aftHigh),                  \
      (OUT, int16_t, hypo))                                                                      \
    F(int16_t, SetTargetRange, (REC, METER_REC, rec), (VALUE, int16_t, befLow),                 \
      (VALUE, int16_t, befHigh), (VALUE, int16_t, aftLow), (VALUE, int16_t, aftHigh),            \
      (VALUE, int16_t, hypo))                                                                    \
    /* Datalogs: binary (meter type 7, decoded record by record) and record. */                 \
    F(int16_t, GetMeterDatalog, (REC, METER_REC, rec), (OUT, METER_BIN_DATALOG, datalog),       \
      (VALUE, int32_t, startSeconds))                                                            \
    F(int16_t, GetMeterDatalogRecordData, (IN, METER_BIN_DATALOG, datalog),                     \
      (VALUE, int16_t, index), (OUT, RECORD_DATA, record))                                       \
    F(int16_t, vb_Upload_Meter_Datalog, (REC, METER_REC, rec), (OUT, METER_DATALOG, datalog))

/*
 * vx_set_yield_hook: the library calls hook(context) now and then during long
 * operations, so the caller's timers keep running.
 * vx_set_clock_hook: the library takes its time from tick_count(context)
 * (milliseconds, wrapping at 2^32) and waits through sleep(context, ms), so a
 * caller on a virtual clock drives the library's time too.
 * Both hold for the calling thread; a null hook restores the library's own
 * behaviour (no yielding; its own clock).
 */
#define VX_HOOK_FUNCTIONS(F)                                                                     \
    F(void, vx_set_yield_hook, (VALUE, vx_yield_fn, hook), (VALUE, void*, context))             \
    F(void, vx_set_clock_hook, (VALUE, vx_tick_fn, tick_count), (VALUE, vx_sleep_fn, sleep),    \
      (VALUE, void*, context))

/* Every function, meter functions first. */
#define VX_TRANSPORT_FUNCTIONS(F) VX_METER_FUNCTIONS(F) VX_HOOK_FUNCTIONS(F)
/* clang-format on */

/*
 * VX_EACH(M, arguments...) expands M(kind, type, name) for each argument tuple,
 * side by side. An M that starts with a comma yields an argument list that
 * VX_COMMA_LIST(...) strips of its first comma.
 */
#define VX_EACH(M, ...) VX_EACH_N_(VX_COUNT_(__VA_ARGS__, 6, 5, 4, 3, 2, 1, 0), M, __VA_ARGS__)
#define VX_COMMA_LIST(...) VX_TAIL_(~__VA_ARGS__)

#define VX_TAIL_(first, ...) __VA_ARGS__
#define VX_COUNT_(a1, a2, a3, a4, a5, a6, n, ...) n
#define VX_EACH_N_(n, M, ...) VX_CAT_(VX_EACH_, n)(M, __VA_ARGS__)
#define VX_CAT_(a, b) VX_CAT2_(a, b)
#define VX_CAT2_(a, b) a##b
#define VX_EACH_1(M, a) M a
#define VX_EACH_2(M, a, ...) M a VX_EACH_1(M, __VA_ARGS__)
#define VX_EACH_3(M, a, ...) M a VX_EACH_2(M, __VA_ARGS__)
#define VX_EACH_4(M, a, ...) M a VX_EACH_3(M, __VA_ARGS__)
#define VX_EACH_5(M, a, ...) M a VX_EACH_4(M, __VA_ARGS__)
#define VX_EACH_6(M, a, ...) M a VX_EACH_5(M, __VA_ARGS__)

/* A parameter as C declares it: objects and lists by pointer. */
#define VX_C_PARAM(kind, type, name) , VX_C_PARAM_##kind(type, name)
#define VX_C_PARAM_REC(type, name) type* name
#define VX_C_PARAM_VALUE(type, name) type name
#define VX_C_PARAM_IN(type, name) type* name
#define VX_C_PARAM_OUT(type, name) type* name
#define VX_C_PARAM_INOUT(type, name) type* name
#define VX_C_PARAM_IN_LIST(type, name) type name[VX_LIST_LENGTH]
#define VX_C_PARAM_OUT_LIST(type, name) type name[VX_LIST_LENGTH]

/* The C parameter list of a function's arguments. */
#define VX_C_PARAMS(...) VX_COMMA_LIST(VX_EACH(VX_C_PARAM, __VA_ARGS__))

#endif /* VARNEL_VANTRIX32_FUNCTIONS_H */
