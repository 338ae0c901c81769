/*
 * A transport library for the loading tests: every function records its name
 * and by-value numbers and returns its own code. Also built without
 * vb_Chk4Meter (RECORDING_TRANSPORT_WITHOUT_CHK4METER) and without the
 * optional yield hook (RECORDING_TRANSPORT_WITHOUT_YIELD_HOOK).
 */
#include <string.h>

#include "varnel/vantrix32.h"

#define EXPORT __attribute__((visibility("default")))

static const char* last_name = "";
static int32_t last_values[5];
static void (*yield_hook)(void*) = 0;
static void* yield_context = 0;

static int16_t record(const char* name, int16_t code, int32_t a, int32_t b, int32_t c, int32_t d, int32_t e) {
    last_name = name;
    last_values[0] = a;
    last_values[1] = b;
    last_values[2] = c;
    last_values[3] = d;
    last_values[4] = e;
    return code;
}

#define R0(name, code) record(#name, code, 0, 0, 0, 0, 0)

EXPORT const char* recording_transport_last_name(void) { return last_name; }
EXPORT int32_t recording_transport_last_value(int index) { return last_values[index]; }

int16_t initialize_meter_structure(METER_REC* rec) { (void)rec; return R0(initialize_meter_structure, -101); }
int16_t find_meter(METER_REC* rec, int32_t found[11], int16_t ports[11]) {
    (void)rec; (void)found;
    return record("find_meter", -102, ports[0], ports[1], 0, 0, 0);
}
int16_t initialize_meter_type_structure(METER_REC* rec, int16_t type) {
    (void)rec;
    return record("initialize_meter_type_structure", -103, type, 0, 0, 0, 0);
}
#ifndef RECORDING_TRANSPORT_WITHOUT_CHK4METER
int16_t vb_Chk4Meter(METER_REC* rec) { (void)rec; return R0(vb_Chk4Meter, -104); }
#endif
int16_t vb_Get_Meter_Firmware(METER_REC* rec) { (void)rec; return R0(vb_Get_Meter_Firmware, -105); }
int16_t vb_Tickle_Meter(METER_REC* rec) { (void)rec; return R0(vb_Tickle_Meter, -106); }
int16_t close_meter(METER_REC* rec) { (void)rec; return R0(close_meter, -107); }
/* The long operation: lets the caller's messages run twice on the way. */
int16_t vb_Clear_Meter_Datalog(METER_REC* rec) {
    rec->Percent_done = 50;
    if (yield_hook) yield_hook(yield_context);
    rec->Percent_done = 100;
    if (yield_hook) yield_hook(yield_context);
    return R0(vb_Clear_Meter_Datalog, -108);
}
int16_t vb_Read_Meter_Options(METER_REC* rec) { (void)rec; return R0(vb_Read_Meter_Options, -109); }
int16_t vb_Read_Meter_Option(METER_REC* rec, int16_t option) {
    (void)rec;
    return record("vb_Read_Meter_Option", -110, option, 0, 0, 0, 0);
}
int16_t vb_Set_Meter_Option(METER_REC* rec, int16_t option, int16_t value) {
    (void)rec;
    return record("vb_Set_Meter_Option", -111, option, value, 0, 0, 0);
}
int16_t vb_Set_Meter_Options(METER_REC* rec, SETTINGS_REC* settings) {
    (void)rec; (void)settings;
    return R0(vb_Set_Meter_Options, -112);
}
int16_t vb_Read_Meter_Clock(METER_REC* rec, int32_t* seconds) {
    (void)rec;
    *seconds = 123456789;
    return R0(vb_Read_Meter_Clock, -113);
}
int16_t vb_Set_Meter_Clock(METER_REC* rec, int32_t seconds) {
    (void)rec;
    return record("vb_Set_Meter_Clock", -114, seconds, 0, 0, 0, 0);
}
int32_t convert_to_seconds(TIME_REC* time) {
    record("convert_to_seconds", 0, time->sec, time->min, 0, 0, 0);
    return 100000 + time->sec;
}
int16_t convert_from_seconds(int32_t seconds, TIME_REC* time) {
    time->sec = (int16_t)(seconds % 60);
    return record("convert_from_seconds", -116, seconds, 0, 0, 0, 0);
}
int16_t GetInitializedFlag(METER_REC* rec, int16_t* flag) { (void)rec; *flag = 1; return R0(GetInitializedFlag, -117); }
int16_t SetInitializedFlag(METER_REC* rec, int16_t flag) {
    (void)rec;
    return record("SetInitializedFlag", -118, flag, 0, 0, 0, 0);
}
int16_t GetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    (void)rec;
    memcpy(name->nameStr, "Rapid", 6);
    return R0(GetInsulinName, -119);
}
int16_t SetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    (void)rec;
    return record("SetInsulinName", -120, name->index, 0, 0, 0, 0);
}
int16_t GetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    (void)rec; (void)name;
    return R0(GetOralMedicationName, -121);
}
int16_t SetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    (void)rec;
    return record("SetOralMedicationName", -122, name->index, 0, 0, 0, 0);
}
int16_t GetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* v) {
    (void)rec; (void)v;
    return R0(GetPredefinedInsulins, -123);
}
int16_t SetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* v) {
    (void)rec; (void)v;
    return R0(SetPredefinedInsulins, -124);
}
int16_t GetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* v) {
    (void)rec; (void)v;
    return R0(GetPredefinedOralMeds, -125);
}
int16_t SetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* v) {
    (void)rec; (void)v;
    return R0(SetPredefinedOralMeds, -126);
}
int16_t GetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* v) { (void)rec; (void)v; return R0(GetMealSegments, -127); }
int16_t SetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* v) { (void)rec; (void)v; return R0(SetMealSegments, -128); }
int16_t GetScheduleSelection(METER_REC* rec, int16_t* selection) {
    (void)rec;
    *selection = 2;
    return R0(GetScheduleSelection, -129);
}
int16_t SetScheduleSelection(METER_REC* rec, int16_t selection) {
    (void)rec;
    return record("SetScheduleSelection", -130, selection, 0, 0, 0, 0);
}
int16_t GetTargetRange(METER_REC* rec, int16_t* befLow, int16_t* befHigh, int16_t* aftLow, int16_t* aftHigh,
                       int16_t* hypo) {
    (void)rec;
    *befLow = 1; *befHigh = 2; *aftLow = 3; *aftHigh = 4; *hypo = 5;
    return R0(GetTargetRange, -131);
}
int16_t SetTargetRange(METER_REC* rec, int16_t befLow, int16_t befHigh, int16_t aftLow, int16_t aftHigh,
                       int16_t hypo) {
    (void)rec;
    return record("SetTargetRange", -132, befLow, befHigh, aftLow, aftHigh, hypo);
}
int16_t GetMeterDatalog(METER_REC* rec, METER_BIN_DATALOG* datalog, int32_t startSeconds) {
    (void)rec; (void)datalog;
    return record("GetMeterDatalog", -133, startSeconds, 0, 0, 0, 0);
}
int16_t GetMeterDatalogRecordData(METER_BIN_DATALOG* datalog, int16_t index, RECORD_DATA* data) {
    (void)datalog; (void)data;
    return record("GetMeterDatalogRecordData", -134, index, 0, 0, 0, 0);
}
int16_t vb_Upload_Meter_Datalog(METER_REC* rec, METER_DATALOG* datalog) {
    (void)rec; (void)datalog;
    return R0(vb_Upload_Meter_Datalog, -135);
}
#ifndef RECORDING_TRANSPORT_WITHOUT_YIELD_HOOK
void vx_set_yield_hook(void (*hook)(void* context), void* context) {
    yield_hook = hook;
    yield_context = context;
}
#endif
