/*
 * The meter transport library: every meter input and output of the
 * component goes through these functions. Varnel ships a library with this
 * interface that simulates the meters (libvantrix32); another library with
 * the same exported names can be used in its place.
 *
 * Each function returns 0 for success or a negative ReturnValues_Enum code,
 * and then also sets Error_code in the record it was passed.
 */
#ifndef VARNEL_VANTRIX32_H
#define VARNEL_VANTRIX32_H

#include <stdint.h>

#include "records.h"

#if defined(VANTRIX32_BUILDING)
#define VX_API __attribute__((visibility("default")))
#else
#define VX_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Identification and session. */
VX_API int16_t initialize_meter_structure(METER_REC* rec);
VX_API int16_t find_meter(METER_REC* rec, int32_t found[11], int16_t ports[11]);
VX_API int16_t initialize_meter_type_structure(METER_REC* rec, int16_t type);
VX_API int16_t vb_Chk4Meter(METER_REC* rec);
VX_API int16_t vb_Get_Meter_Firmware(METER_REC* rec);
VX_API int16_t vb_Tickle_Meter(METER_REC* rec);
VX_API int16_t close_meter(METER_REC* rec);
VX_API int16_t vb_Clear_Meter_Datalog(METER_REC* rec);

/* General options. */
VX_API int16_t vb_Read_Meter_Options(METER_REC* rec);
VX_API int16_t vb_Read_Meter_Option(METER_REC* rec, int16_t option);
VX_API int16_t vb_Set_Meter_Option(METER_REC* rec, int16_t option, int16_t value);
VX_API int16_t vb_Set_Meter_Options(METER_REC* rec, SETTINGS_REC* settings);

/* Clock, in transport seconds. */
VX_API int16_t vb_Read_Meter_Clock(METER_REC* rec, int32_t* seconds);
VX_API int16_t vb_Set_Meter_Clock(METER_REC* rec, int32_t seconds);
VX_API int32_t convert_to_seconds(TIME_REC* time);
VX_API int16_t convert_from_seconds(int32_t seconds, TIME_REC* time);

/* The meter's initialised flag. */
VX_API int16_t GetInitializedFlag(METER_REC* rec, int16_t* flag);
VX_API int16_t SetInitializedFlag(METER_REC* rec, int16_t flag);

/* Medication names, favourites, meal schedule and targets. */
VX_API int16_t GetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name);
VX_API int16_t SetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name);
VX_API int16_t GetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name);
VX_API int16_t SetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name);
VX_API int16_t GetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* insulins);
VX_API int16_t SetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* insulins);
VX_API int16_t GetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* meds);
VX_API int16_t SetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* meds);
VX_API int16_t GetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* segments);
VX_API int16_t SetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* segments);
VX_API int16_t GetScheduleSelection(METER_REC* rec, int16_t* selection);
VX_API int16_t SetScheduleSelection(METER_REC* rec, int16_t selection);
VX_API int16_t GetTargetRange(METER_REC* rec, int16_t* befLow, int16_t* befHigh, int16_t* aftLow,
                              int16_t* aftHigh, int16_t* hypo);
VX_API int16_t SetTargetRange(METER_REC* rec, int16_t befLow, int16_t befHigh, int16_t aftLow,
                              int16_t aftHigh, int16_t hypo);

/* Datalogs: binary (meter type 7, decoded record by record) and record. */
VX_API int16_t GetMeterDatalog(METER_REC* rec, METER_BIN_DATALOG* datalog, int32_t startSeconds);
VX_API int16_t GetMeterDatalogRecordData(METER_BIN_DATALOG* datalog, int16_t index,
                                         RECORD_DATA* record);
VX_API int16_t vb_Upload_Meter_Datalog(METER_REC* rec, METER_DATALOG* datalog);

/*
 * Optional extension: a library that exports it calls hook(context) now and
 * then during long operations, so the caller's timers keep running.
 * nullptr removes the hook.
 */
VX_API void vx_set_yield_hook(void (*hook)(void* context), void* context);

#ifdef __cplusplus
}
#endif

#endif /* VARNEL_VANTRIX32_H */
