// The records of the type library Varnel are those of varnel/records.h: the
// same size and every field at the same offset, checked when this compiles.
// The type library is generated with 4-byte alignment; its header is read
// here with the same packing.
#include <oaidl.h>
#include <ocidl.h>

#include <cstddef>
#include <cstdint>

namespace ours {
#include "varnel/records.h"
}

#define VARNEL_IDL_RECORDS
#pragma pack(push, 4)
#include "varnel_com.h"
#pragma pack(pop)

#define SAME_FIELD(type, field) static_assert(offsetof(::type, field) == offsetof(ours::type, field), #type "." #field)
#define SAME_SIZE(type) static_assert(sizeof(::type) == sizeof(ours::type), #type " size")

SAME_SIZE(dcb);
SAME_FIELD(dcb, BaudRate);
SAME_FIELD(dcb, fFlags);
SAME_FIELD(dcb, wReserved);
SAME_FIELD(dcb, XonLim);
SAME_FIELD(dcb, XoffLim);
SAME_FIELD(dcb, ByteSize);
SAME_FIELD(dcb, Parity);
SAME_FIELD(dcb, StopBits);
SAME_FIELD(dcb, XonChar);
SAME_FIELD(dcb, XoffChar);
SAME_FIELD(dcb, ErrorChar);
SAME_FIELD(dcb, EofChar);
SAME_FIELD(dcb, EvtChar);
SAME_FIELD(dcb, wReserved1);
SAME_SIZE(PORT_REC);
SAME_FIELD(PORT_REC, Id);
SAME_FIELD(PORT_REC, com_number);
SAME_FIELD(PORT_REC, baud_rate);
SAME_FIELD(PORT_REC, dcb);
SAME_SIZE(SETTINGS_REC);
SAME_FIELD(SETTINGS_REC, Availability);
SAME_FIELD(SETTINGS_REC, nValue);
SAME_FIELD(SETTINGS_REC, nValue_min);
SAME_FIELD(SETTINGS_REC, nValue_max);
SAME_SIZE(LANG_MAP_TYPE);
SAME_SIZE(EVENT_MAP_TYPE);
SAME_SIZE(INSULIN_MAP_TYPE);
SAME_SIZE(METER_REC);
SAME_FIELD(METER_REC, Error_code);
SAME_FIELD(METER_REC, Serial_number);
SAME_FIELD(METER_REC, Firmware_number);
SAME_FIELD(METER_REC, port);
SAME_FIELD(METER_REC, Setting);
SAME_FIELD(METER_REC, Meter_upload_time);
SAME_FIELD(METER_REC, Computer_upload_time);
SAME_FIELD(METER_REC, Checkstrip_range_lower_limit);
SAME_FIELD(METER_REC, Checkstrip_range_upper_limit);
SAME_FIELD(METER_REC, Checkstrip_range_approx);
SAME_FIELD(METER_REC, Percent_done);
SAME_FIELD(METER_REC, Stage);
SAME_FIELD(METER_REC, Upper_glucose_report_level);
SAME_FIELD(METER_REC, Lower_glucose_report_level);
SAME_FIELD(METER_REC, Upper_glucose_error_level);
SAME_FIELD(METER_REC, Lower_glucose_error_level);
SAME_FIELD(METER_REC, langMap);
SAME_FIELD(METER_REC, eventMap);
SAME_FIELD(METER_REC, insulinMap);
SAME_FIELD(METER_REC, Meter_name);
SAME_FIELD(METER_REC, Plasma_cal_flag);
SAME_FIELD(METER_REC, Time_min);
SAME_FIELD(METER_REC, Time_max);
SAME_FIELD(METER_REC, FuncPtr_User_func);
SAME_FIELD(METER_REC, FuncPtr_upload_meter_datalog);
SAME_FIELD(METER_REC, Raw_buff);
SAME_SIZE(TEST_REC);
SAME_FIELD(TEST_REC, Sample_detected);
SAME_FIELD(TEST_REC, Medication);
SAME_FIELD(TEST_REC, Event_code);
SAME_FIELD(TEST_REC, Flags);
SAME_FIELD(TEST_REC, T_Type);
SAME_SIZE(data_rec);
SAME_FIELD(data_rec, Valid);
SAME_FIELD(data_rec, ResultApproximated);
SAME_FIELD(data_rec, D_Time);
SAME_FIELD(data_rec, Test);
SAME_SIZE(METER_DATALOG);
SAME_FIELD(METER_DATALOG, DataLog);
SAME_SIZE(METER_BIN_DATALOG);
SAME_FIELD(METER_BIN_DATALOG, binBuf);
SAME_SIZE(RECORD_DATA);
SAME_FIELD(RECORD_DATA, timeStamp);
SAME_FIELD(RECORD_DATA, hbA1C);
SAME_FIELD(RECORD_DATA, microalbumin);
SAME_FIELD(RECORD_DATA, weight);
SAME_FIELD(RECORD_DATA, height);
SAME_FIELD(RECORD_DATA, oralMedDosage);
SAME_FIELD(RECORD_DATA, InsulinType);
SAME_FIELD(RECORD_DATA, insulinDosage);
SAME_FIELD(RECORD_DATA, bolusSetting);
SAME_FIELD(RECORD_DATA, dailyTotalSetting);
SAME_FIELD(RECORD_DATA, ExerciseLevel);
SAME_FIELD(RECORD_DATA, newCalCode);
SAME_SIZE(INSULIN_OR_ORAL_MED_NAME_TYPE);
SAME_FIELD(INSULIN_OR_ORAL_MED_NAME_TYPE, nameStr);
SAME_SIZE(PREDEFINED_INSULINS_TYPE);
SAME_SIZE(PREDEFINED_ORAL_MEDS_TYPE);
SAME_SIZE(MEAL_SEGMENTS_TYPE);

static_assert(int(::ME_INVALID_HANDLE) == int(ours::ME_INVALID_HANDLE) && int(::eParvix) == int(ours::eParvix) &&
              int(::eInsulinPumpUse) == int(ours::eInsulinPumpUse));
