/**
 * @file records.h
 * Records shared byte for byte between the component, its clients and the
 * meter transport library, with the return codes and enumerations.
 *
 * This header is C-compatible: transport libraries written in C include it.
 * The layouts are a binary interface: Integer = int16_t, Long = int32_t,
 * Byte = uint8_t, Double = double, little-endian, fields aligned to their own
 * size up to 4 bytes (so a double sits on a 4-byte boundary).
 */
#ifndef VARNEL_RECORDS_H
#define VARNEL_RECORDS_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
#define VARNEL_STATIC_ASSERT(cond, msg) static_assert(cond, msg)
extern "C" {
#else
#define VARNEL_STATIC_ASSERT(cond, msg) _Static_assert(cond, msg)
#endif

#pragma pack(push, 4)

/** Return codes of every request and of the transport library. */
typedef enum ReturnValues_Enum {
    ME_SUCCESS = 0,
    ME_CHKSUM_ERROR = -1,
    ME_TIME_OUT = -2,
    ME_COM_ERROR = -3,
    ME_COMP_FAIL = -4,
    ME_EMPTY = -6,
    ME_NOMEM = -7,
    ME_DIFFERENT_DEVICE = -8,
    ME_VALIDATION_ERROR = -9,
    ME_CLOCK_ERROR = -10,
    ME_NOT_SUPPORTED = -11,
    ME_NO_DEVICE = -13,
    ME_RESET_METER = -14,
    ME_NO_SERIAL_PORTS = -15,
    ME_UNKNOWN = -16,
    ME_FAIL = -17,
    ME_NO_PORT_OPENED = -18,
    ME_BAD_PARAMETER = -19,
    ME_OVERFLOW = -20,
    ME_BUFREMPTY = -21,
    ME_WRONG_TYPE = -22,
    ME_QUIT = -23,
    ME_UNSUPPORTED_PORTS = -25,
    ME_BAD_DEVICEINFO = -26,
    ME_CLSIDFROMPROGIDFAILS = -27,
    ME_COCREATEINSTANCEFAILS = -28,
    ME_DISPEVENTADVISEFAILS = -29,
    ME_DISPEVENTUNADVISEFAILS = -30,
    ME_PARTIALSUCCESS = -31,
    ME_FATAL = -32,
    ME_INVALID_XMLWRAPPOBJ = -33,
    ME_INVALID_REG_ENTRIES = -34,
    ME_BAD_DCB = -35,
    ME_INVALID_HANDLE = -36
} ReturnValues_Enum;

/** The meter family member, as found in M_Type and in a document's TypeID. */
typedef enum MeterType_Enum {
    eNoMeter = 0,
    eCVTarnConsumerMeter = 1,
    eCVPellis = 2,
    eDunmark = 3,
    eQuillaandBremo = 4,
    eCVTolvoMeter = 5,
    eCorviaZenta = 6,
    eMorvex = 7,
    eParvix = 8
} MeterType_Enum;

/** Index into the arrays of SETTINGS_REC and option number of the option calls. */
typedef enum MeterOptions_Enum {
    eStripCalCode = 0,
    eBeepStatus = 1,
    eUnits = 2,
    eNumericSeparator = 3,
    eDateFormat = 4,
    eTimeFormat = 5,
    eLanguage = 6,
    eCommunicationMode = 7,
    eCommunicationRate = 8,
    eTranslateNewLang = 9,
    eEvevtAveraging = 10,
    eInsulinPrompt = 11,
    eDisplayLastTest = 12,
    eDayAverage = 13,
    eDisplayClock = 14,
    eDaylightSavings = 15,
    eWeekStartDay = 16,
    eCholestrolUnits = 17,
    eInsulinPumpUse = 18
} MeterOptions_Enum;

/** What one binary datalog record holds: the recType of RECORD_DATA. Other
   numbers carry only a time stamp and an ordinal. */
typedef enum RecordType_Enum {
    VX_REC_GLUCOSE = 0,           /**< a blood or control-solution test */
    VX_REC_ORAL_MEDICATION = 10,  /**< oralMedType, oralMedDosage */
    VX_REC_INSULIN = 11,          /**< InsulinType, insulinDosage */
    VX_REC_PUMP_BOLUS = 12,       /**< bolusSetting */
    VX_REC_PUMP_DAILY_TOTAL = 13, /**< dailyTotalSetting */
    VX_REC_CARBS_FATS = 20,       /**< a meal's carbs and fats, or alcohol (mealSegment 4) */
    VX_REC_CALORIES_PROTEIN = 21, /**< a meal's calories and protein */
    VX_REC_KETONES = 30,
    VX_REC_HBA1C = 31,
    VX_REC_MICROALBUMIN = 32,
    VX_REC_CHOLESTEROL_LDL_HDL = 33,
    VX_REC_CHOLESTEROL_TOTAL_TRIG = 34, /**< total cholesterol and triglycerides */
    VX_REC_BLOOD_PRESSURE = 35,         /**< systole, diastole */
    VX_REC_WEIGHT_HEIGHT = 36,
    VX_REC_HEALTH_NOTES = 37, /**< stress, feeling hypo, illness, menses, vacation, other */
    VX_REC_LAST_VISIT = 38,
    VX_REC_EXERCISE = 45, /**< ExerciseLevel, exerciseDuration in minutes */
    VX_REC_CAL_CODE = 52  /**< a strip calibration code change */
} RecordType_Enum;

/** Serial-port control block, in the layout of the Windows DCB. */
typedef struct dcb {
    int32_t DCBlength;
    int32_t BaudRate;
    int32_t fFlags;
    int16_t wReserved;
    int16_t XonLim;
    int16_t XoffLim;
    uint8_t ByteSize;
    uint8_t Parity;
    uint8_t StopBits;
    uint8_t XonChar;
    uint8_t XoffChar;
    uint8_t ErrorChar;
    uint8_t EofChar;
    uint8_t EvtChar;
    int16_t wReserved1;
} dcb;

/** The serial port in use. */
typedef struct PORT_REC {
    int16_t portStatus;
    int32_t Id; /**< open port handle; 0 or less when none */
    int16_t com_number;
    int16_t baud_rate;
    struct dcb dcb;
} PORT_REC;

/** The meter's options, each array indexed by MeterOptions_Enum. */
typedef struct SETTINGS_REC {
    int16_t Status[22];
    int16_t Availability[22]; /**< 0 no such option, 1 read-only, 2 writable */
    int16_t nValue[22];
    int16_t nValue_min[22];
    int16_t nValue_max[22];
} SETTINGS_REC;

typedef struct LANG_MAP_TYPE {
    int16_t numLanguages;
    int16_t languages[20];
} LANG_MAP_TYPE;

typedef struct EVENT_MAP_TYPE {
    int16_t numEvents;
    int16_t events[16];
} EVENT_MAP_TYPE;

typedef struct INSULIN_MAP_TYPE {
    int16_t numInsulins;
    int16_t insulins[14];
} INSULIN_MAP_TYPE;

/** One meter session's record, passed to every transport call. */
typedef struct METER_REC {
    int16_t M_Type;
    int16_t Error_code;
    uint8_t Serial_number[20];
    uint8_t Firmware_number[20];
    PORT_REC port;
    SETTINGS_REC Setting;
    int32_t Meter_upload_time;
    int32_t Computer_upload_time;
    int16_t Checkstrip_range_lower_limit;
    int16_t Checkstrip_range_upper_limit;
    int16_t Checkstrip_range_approx;
    int16_t Percent_done;
    int16_t Stage;
    int16_t Upper_glucose_report_level;
    int16_t Lower_glucose_report_level;
    int16_t Upper_glucose_error_level;
    int16_t Lower_glucose_error_level;
    LANG_MAP_TYPE langMap;
    EVENT_MAP_TYPE eventMap;
    INSULIN_MAP_TYPE insulinMap;
    uint8_t Meter_name[40];
    int16_t Plasma_cal_flag;
    int32_t Time_min;
    int32_t Time_max;
    int32_t FuncPtr_User_func;
    int32_t FuncPtr_Error_func;
    int32_t FuncPtr_chk4meter;
    int32_t FuncPtr_clear_meter_datalog;
    int32_t FuncPtr_get_meter_firmware;
    int32_t FuncPtr_get_meter_ID;
    int32_t FuncPtr_read_meter_clock;
    int32_t FuncPtr_read_meter_option;
    int32_t FuncPtr_read_meter_options;
    int32_t FuncPtr_set_meter_clock;
    int32_t FuncPtr_set_meter_option;
    int32_t FuncPtr_set_meter_options;
    int32_t FuncPtr_tickle_meter;
    int32_t FuncPtr_upload_meter_datalog;
    uint8_t Raw_buff[1536];
} METER_REC;

/** One test inside a record-datalog entry. */
typedef struct TEST_REC {
    int16_t Result;
    int16_t Sample_detected;
    double Medication;
    int16_t Event_code;
    int16_t Flags;
    int16_t T_Type;
} TEST_REC;

/** One record-datalog entry. */
typedef struct data_rec {
    int16_t D_Type;
    int16_t Valid;
    int16_t ResultApproximated;
    int32_t D_Time; /**< transport seconds */
    TEST_REC Test;
} data_rec;

/** The record datalog of meter types 1-6 and 8. */
typedef struct METER_DATALOG {
    int16_t recordCount;
    int16_t ValidRecordCount;
    int16_t maxRecordsForMeter;
    data_rec DataLog[255];
} METER_DATALOG;

/** The binary datalog of meter type 7, decoded with GetMeterDatalogRecordData. */
typedef struct METER_BIN_DATALOG {
    int16_t recordCount;
    int16_t corruptedCount;
    int16_t maxRecordsForMeter;
    uint8_t binBuf[30640];
} METER_BIN_DATALOG;

/** One decoded record of a binary datalog. */
typedef struct RECORD_DATA {
    int16_t recType; /**< a RecordType_Enum value; kept 16 bits wide by the layout */
    int32_t timeStamp;
    int16_t Ordinal;
    int16_t reading;
    int16_t controlFlag;
    int16_t alternateSiteFlag;
    int16_t dietLabel;
    int16_t exerciseLabel;
    int16_t stressFlag;
    int16_t feelHypoFlag;
    int16_t illnessFlag;
    int16_t mensesFlag;
    int16_t vacationFlag;
    int16_t otherFlag;
    int16_t mealSegment;
    int16_t carbs;
    int16_t fats;
    int16_t calories;
    int16_t protein;
    int16_t ketones;
    double hbA1C;
    int16_t microalbumin;
    int16_t cholesterolLDL;
    int16_t cholesterolHDL;
    int16_t cholesterolTotal;
    int16_t cholesterolTriglyceride;
    int16_t bloodPressureSystole;
    int16_t bloodPressureDiastole;
    double weight;
    double height;
    int16_t visit;
    int16_t oralMedType;
    double oralMedDosage;
    int16_t InsulinType;
    double insulinDosage;
    double bolusSetting;
    double dailyTotalSetting;
    int16_t ExerciseLevel;
    int16_t exerciseDuration;
    int16_t oldCalCode;
    int16_t newCalCode;
} RECORD_DATA;

/** One insulin or oral-medication name slot. */
typedef struct INSULIN_OR_ORAL_MED_NAME_TYPE {
    int16_t index;
    int16_t notChangeable;
    uint8_t nameStr[10];
} INSULIN_OR_ORAL_MED_NAME_TYPE;

typedef struct PREDEFINED_INSULINS_TYPE {
    int16_t InsulinType[3];
} PREDEFINED_INSULINS_TYPE;

typedef struct PREDEFINED_ORAL_MEDS_TYPE {
    int16_t oralMedType[5];
} PREDEFINED_ORAL_MEDS_TYPE;

/** Meal-segment start times in quarter hours. */
typedef struct MEAL_SEGMENTS_TYPE {
    int16_t mealSegments[7];
} MEAL_SEGMENTS_TYPE;

/** The transport's time record; wday, yday and isdst are informative. */
typedef struct TIME_REC {
    int16_t sec;
    int16_t min;
    int16_t hour;
    int16_t mday;
    int16_t mon;
    int16_t year;
    int16_t wday;
    int16_t yday;
    int16_t isdst;
} TIME_REC;

#pragma pack(pop)

/* The binary layout, checked at compile time (left out of the API reference). */
/** @cond */
VARNEL_STATIC_ASSERT(sizeof(dcb) == 28, "dcb size");
VARNEL_STATIC_ASSERT(offsetof(dcb, BaudRate) == 4 && offsetof(dcb, fFlags) == 8 && offsetof(dcb, wReserved) == 12 &&
                         offsetof(dcb, XonLim) == 14 && offsetof(dcb, XoffLim) == 16 && offsetof(dcb, ByteSize) == 18 &&
                         offsetof(dcb, Parity) == 19 && offsetof(dcb, StopBits) == 20 && offsetof(dcb, XonChar) == 21 &&
                         offsetof(dcb, XoffChar) == 22 && offsetof(dcb, ErrorChar) == 23 &&
                         offsetof(dcb, EofChar) == 24 && offsetof(dcb, EvtChar) == 25 &&
                         offsetof(dcb, wReserved1) == 26,
                     "dcb offsets");
VARNEL_STATIC_ASSERT(sizeof(PORT_REC) == 40, "PORT_REC size");
VARNEL_STATIC_ASSERT(offsetof(PORT_REC, Id) == 4 && offsetof(PORT_REC, com_number) == 8 &&
                         offsetof(PORT_REC, baud_rate) == 10 && offsetof(PORT_REC, dcb) == 12,
                     "PORT_REC offsets");
VARNEL_STATIC_ASSERT(sizeof(SETTINGS_REC) == 220, "SETTINGS_REC size");
VARNEL_STATIC_ASSERT(offsetof(SETTINGS_REC, Availability) == 44 && offsetof(SETTINGS_REC, nValue) == 88 &&
                         offsetof(SETTINGS_REC, nValue_min) == 132 && offsetof(SETTINGS_REC, nValue_max) == 176,
                     "SETTINGS_REC offsets");
VARNEL_STATIC_ASSERT(sizeof(LANG_MAP_TYPE) == 42, "LANG_MAP_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(EVENT_MAP_TYPE) == 34, "EVENT_MAP_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(INSULIN_MAP_TYPE) == 30, "INSULIN_MAP_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(METER_REC) == 2080, "METER_REC size");
VARNEL_STATIC_ASSERT(offsetof(METER_REC, Error_code) == 2 && offsetof(METER_REC, Serial_number) == 4 &&
                         offsetof(METER_REC, Firmware_number) == 24 && offsetof(METER_REC, port) == 44 &&
                         offsetof(METER_REC, Setting) == 84 && offsetof(METER_REC, Meter_upload_time) == 304 &&
                         offsetof(METER_REC, Computer_upload_time) == 308 &&
                         offsetof(METER_REC, Checkstrip_range_lower_limit) == 312 &&
                         offsetof(METER_REC, Checkstrip_range_upper_limit) == 314 &&
                         offsetof(METER_REC, Checkstrip_range_approx) == 316 &&
                         offsetof(METER_REC, Percent_done) == 318 && offsetof(METER_REC, Stage) == 320 &&
                         offsetof(METER_REC, Upper_glucose_report_level) == 322 &&
                         offsetof(METER_REC, Lower_glucose_report_level) == 324 &&
                         offsetof(METER_REC, Upper_glucose_error_level) == 326 &&
                         offsetof(METER_REC, Lower_glucose_error_level) == 328 && offsetof(METER_REC, langMap) == 330 &&
                         offsetof(METER_REC, eventMap) == 372 && offsetof(METER_REC, insulinMap) == 406 &&
                         offsetof(METER_REC, Meter_name) == 436 && offsetof(METER_REC, Plasma_cal_flag) == 476 &&
                         offsetof(METER_REC, Time_min) == 480 && offsetof(METER_REC, Time_max) == 484 &&
                         offsetof(METER_REC, FuncPtr_User_func) == 488 &&
                         offsetof(METER_REC, FuncPtr_upload_meter_datalog) == 540 &&
                         offsetof(METER_REC, Raw_buff) == 544,
                     "METER_REC offsets");
VARNEL_STATIC_ASSERT(sizeof(TEST_REC) == 20, "TEST_REC size");
VARNEL_STATIC_ASSERT(offsetof(TEST_REC, Sample_detected) == 2 && offsetof(TEST_REC, Medication) == 4 &&
                         offsetof(TEST_REC, Event_code) == 12 && offsetof(TEST_REC, Flags) == 14 &&
                         offsetof(TEST_REC, T_Type) == 16,
                     "TEST_REC offsets");
VARNEL_STATIC_ASSERT(sizeof(data_rec) == 32, "data_rec size");
VARNEL_STATIC_ASSERT(offsetof(data_rec, Valid) == 2 && offsetof(data_rec, ResultApproximated) == 4 &&
                         offsetof(data_rec, D_Time) == 8 && offsetof(data_rec, Test) == 12,
                     "data_rec offsets");
VARNEL_STATIC_ASSERT(sizeof(METER_DATALOG) == 8168, "METER_DATALOG size");
VARNEL_STATIC_ASSERT(offsetof(METER_DATALOG, ValidRecordCount) == 2 &&
                         offsetof(METER_DATALOG, maxRecordsForMeter) == 4 && offsetof(METER_DATALOG, DataLog) == 8,
                     "METER_DATALOG offsets");
VARNEL_STATIC_ASSERT(sizeof(METER_BIN_DATALOG) == 30646, "METER_BIN_DATALOG size");
VARNEL_STATIC_ASSERT(offsetof(METER_BIN_DATALOG, corruptedCount) == 2 &&
                         offsetof(METER_BIN_DATALOG, maxRecordsForMeter) == 4 &&
                         offsetof(METER_BIN_DATALOG, binBuf) == 6,
                     "METER_BIN_DATALOG offsets");
VARNEL_STATIC_ASSERT(sizeof(RECORD_DATA) == 132, "RECORD_DATA size");
VARNEL_STATIC_ASSERT(offsetof(RECORD_DATA, timeStamp) == 4 && offsetof(RECORD_DATA, Ordinal) == 8 &&
                         offsetof(RECORD_DATA, reading) == 10 && offsetof(RECORD_DATA, controlFlag) == 12 &&
                         offsetof(RECORD_DATA, alternateSiteFlag) == 14 && offsetof(RECORD_DATA, dietLabel) == 16 &&
                         offsetof(RECORD_DATA, exerciseLabel) == 18 && offsetof(RECORD_DATA, stressFlag) == 20 &&
                         offsetof(RECORD_DATA, feelHypoFlag) == 22 && offsetof(RECORD_DATA, illnessFlag) == 24 &&
                         offsetof(RECORD_DATA, mensesFlag) == 26 && offsetof(RECORD_DATA, vacationFlag) == 28 &&
                         offsetof(RECORD_DATA, otherFlag) == 30 && offsetof(RECORD_DATA, mealSegment) == 32 &&
                         offsetof(RECORD_DATA, carbs) == 34 && offsetof(RECORD_DATA, fats) == 36 &&
                         offsetof(RECORD_DATA, calories) == 38 && offsetof(RECORD_DATA, protein) == 40 &&
                         offsetof(RECORD_DATA, ketones) == 42 && offsetof(RECORD_DATA, hbA1C) == 44,
                     "RECORD_DATA offsets, first half");
VARNEL_STATIC_ASSERT(offsetof(RECORD_DATA, microalbumin) == 52 && offsetof(RECORD_DATA, cholesterolLDL) == 54 &&
                         offsetof(RECORD_DATA, cholesterolHDL) == 56 && offsetof(RECORD_DATA, cholesterolTotal) == 58 &&
                         offsetof(RECORD_DATA, cholesterolTriglyceride) == 60 &&
                         offsetof(RECORD_DATA, bloodPressureSystole) == 62 &&
                         offsetof(RECORD_DATA, bloodPressureDiastole) == 64 && offsetof(RECORD_DATA, weight) == 68 &&
                         offsetof(RECORD_DATA, height) == 76 && offsetof(RECORD_DATA, visit) == 84 &&
                         offsetof(RECORD_DATA, oralMedType) == 86 && offsetof(RECORD_DATA, oralMedDosage) == 88 &&
                         offsetof(RECORD_DATA, InsulinType) == 96 && offsetof(RECORD_DATA, insulinDosage) == 100 &&
                         offsetof(RECORD_DATA, bolusSetting) == 108 &&
                         offsetof(RECORD_DATA, dailyTotalSetting) == 116 &&
                         offsetof(RECORD_DATA, ExerciseLevel) == 124 &&
                         offsetof(RECORD_DATA, exerciseDuration) == 126 && offsetof(RECORD_DATA, oldCalCode) == 128 &&
                         offsetof(RECORD_DATA, newCalCode) == 130,
                     "RECORD_DATA offsets, second half");
VARNEL_STATIC_ASSERT(sizeof(INSULIN_OR_ORAL_MED_NAME_TYPE) == 14 &&
                         offsetof(INSULIN_OR_ORAL_MED_NAME_TYPE, notChangeable) == 2 &&
                         offsetof(INSULIN_OR_ORAL_MED_NAME_TYPE, nameStr) == 4,
                     "INSULIN_OR_ORAL_MED_NAME_TYPE layout");
VARNEL_STATIC_ASSERT(sizeof(PREDEFINED_INSULINS_TYPE) == 6, "PREDEFINED_INSULINS_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(PREDEFINED_ORAL_MEDS_TYPE) == 10, "PREDEFINED_ORAL_MEDS_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(MEAL_SEGMENTS_TYPE) == 14, "MEAL_SEGMENTS_TYPE size");
VARNEL_STATIC_ASSERT(sizeof(TIME_REC) == 18, "TIME_REC size");
/** @endcond */

#ifdef __cplusplus
}
#endif

#endif /* VARNEL_RECORDS_H */
