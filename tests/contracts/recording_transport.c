/* A transport library for the loading tests: every function records its name and
 * by-value numbers and returns its own code; the getters also fill their outputs. */
#include <string.h>

#include "varnel/vantrix32.h"

/* Most functions read none of their arguments. */
#pragma GCC diagnostic ignored "-Wunused-parameter"

#define EXPORT __attribute__((visibility("default")))

/* What the last call recorded, for the tests to read. */
EXPORT const char* last_name = "";
EXPORT int32_t last_values[5];
static void (*yield_hook)(void*) = 0;
static void* yield_context = 0;

static int16_t record(const char* name, int16_t code, const int32_t values[5]) {
    last_name = name;
    memcpy(last_values, values, sizeof last_values);
    return code;
}

/* A function of the library: does `effect`, records up to five numbers and returns `code`. */
#define FN(code, fn, params, effect, ...) \
    int16_t fn params { effect; return record(#fn, code, (const int32_t[5]){__VA_ARGS__}); }

FN(-101, initialize_meter_structure, (METER_REC* rec), , 0)
FN(-102, find_meter, (METER_REC* rec, int32_t found[11], int16_t ports[11]), , ports[0], ports[1])
FN(-103, initialize_meter_type_structure, (METER_REC* rec, int16_t type), , type)
#ifndef RECORDING_TRANSPORT_NO_CHK4METER_VARIANT
FN(-104, vb_Chk4Meter, (METER_REC* rec), , 0)
#endif
FN(-105, vb_Get_Meter_Firmware, (METER_REC* rec), , 0)
FN(-106, vb_Tickle_Meter, (METER_REC* rec), , 0)
FN(-107, close_meter, (METER_REC* rec), , 0)
/* The long operation: lets the caller's messages run twice on the way. */
int16_t vb_Clear_Meter_Datalog(METER_REC* rec) {
    rec->Percent_done = 50;
    if (yield_hook) yield_hook(yield_context);
    rec->Percent_done = 100;
    if (yield_hook) yield_hook(yield_context);
    return record("vb_Clear_Meter_Datalog", -108, (const int32_t[5]){0});
}
FN(-109, vb_Read_Meter_Options, (METER_REC* rec), , 0)
FN(-110, vb_Read_Meter_Option, (METER_REC* rec, int16_t option), , option)
FN(-111, vb_Set_Meter_Option, (METER_REC* rec, int16_t option, int16_t value), , option, value)
FN(-112, vb_Set_Meter_Options, (METER_REC* rec, SETTINGS_REC* settings), , 0)
FN(-113, vb_Read_Meter_Clock, (METER_REC* rec, int32_t* seconds), *seconds = 123456789, 0)
FN(-114, vb_Set_Meter_Clock, (METER_REC* rec, int32_t seconds), , seconds)
int32_t convert_to_seconds(TIME_REC* time) {
    return record("convert_to_seconds", -115, (const int32_t[5]){time->sec, time->min});
}
FN(-116, convert_from_seconds, (int32_t seconds, TIME_REC* time), time->sec = (int16_t)(seconds % 60), seconds)
FN(-117, GetInitializedFlag, (METER_REC* rec, int16_t* flag), *flag = 1, 0)
FN(-118, SetInitializedFlag, (METER_REC* rec, int16_t flag), , flag)
FN(-119, GetInsulinName, (METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name), memcpy(name->nameStr, "Rapid", 6), 0)
FN(-120, SetInsulinName, (METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name), , name->index)
FN(-121, GetOralMedicationName, (METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name), , 0)
FN(-122, SetOralMedicationName, (METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name), , name->index)
FN(-123, GetPredefinedInsulins, (METER_REC* rec, PREDEFINED_INSULINS_TYPE* v), , 0)
FN(-124, SetPredefinedInsulins, (METER_REC* rec, PREDEFINED_INSULINS_TYPE* v), , 0)
FN(-125, GetPredefinedOralMeds, (METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* v), , 0)
FN(-126, SetPredefinedOralMeds, (METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* v), , 0)
FN(-127, GetMealSegments, (METER_REC* rec, MEAL_SEGMENTS_TYPE* v), , 0)
FN(-128, SetMealSegments, (METER_REC* rec, MEAL_SEGMENTS_TYPE* v), , 0)
FN(-129, GetScheduleSelection, (METER_REC* rec, int16_t* selection), *selection = 2, 0)
FN(-130, SetScheduleSelection, (METER_REC* rec, int16_t selection), , selection)
FN(-131, GetTargetRange, (METER_REC* rec, int16_t* bl, int16_t* bh, int16_t* al, int16_t* ah, int16_t* hypo),
   (*bl = 1, *bh = 2, *al = 3, *ah = 4, *hypo = 5), 0)
FN(-132, SetTargetRange, (METER_REC* rec, int16_t bl, int16_t bh, int16_t al, int16_t ah, int16_t hypo),
   , bl, bh, al, ah, hypo)
FN(-133, GetMeterDatalog, (METER_REC* rec, METER_BIN_DATALOG* datalog, int32_t start), , start)
FN(-134, GetMeterDatalogRecordData, (METER_BIN_DATALOG* datalog, int16_t index, RECORD_DATA* data), , index)
FN(-135, vb_Upload_Meter_Datalog, (METER_REC* rec, METER_DATALOG* datalog), , 0)
#ifndef RECORDING_TRANSPORT_NO_YIELD_HOOK_VARIANT
void vx_set_yield_hook(void (*hook)(void* context), void* context) {
    yield_hook = hook;
    yield_context = context;
}
#endif
