// The component's side of the transport contract: one member per function of
// the transport library's C interface, so a session can run on a loaded
// library, the statically linked simulator or a scripted fake.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "varnel/records.h"

namespace varnel::detail {

// Every function of the transport library, as pointers (a missing optional one is nullptr).
struct TransportFunctions {
    std::int16_t (*initialize_meter_structure)(METER_REC*);
    std::int16_t (*find_meter)(METER_REC*, std::int32_t*, std::int16_t*);
    std::int16_t (*initialize_meter_type_structure)(METER_REC*, std::int16_t);
    std::int16_t (*vb_Chk4Meter)(METER_REC*);
    std::int16_t (*vb_Get_Meter_Firmware)(METER_REC*);
    std::int16_t (*vb_Tickle_Meter)(METER_REC*);
    std::int16_t (*close_meter)(METER_REC*);
    std::int16_t (*vb_Clear_Meter_Datalog)(METER_REC*);
    std::int16_t (*vb_Read_Meter_Options)(METER_REC*);
    std::int16_t (*vb_Read_Meter_Option)(METER_REC*, std::int16_t);
    std::int16_t (*vb_Set_Meter_Option)(METER_REC*, std::int16_t, std::int16_t);
    std::int16_t (*vb_Set_Meter_Options)(METER_REC*, SETTINGS_REC*);
    std::int16_t (*vb_Read_Meter_Clock)(METER_REC*, std::int32_t*);
    std::int16_t (*vb_Set_Meter_Clock)(METER_REC*, std::int32_t);
    std::int32_t (*convert_to_seconds)(TIME_REC*);
    std::int16_t (*convert_from_seconds)(std::int32_t, TIME_REC*);
    std::int16_t (*GetInitializedFlag)(METER_REC*, std::int16_t*);
    std::int16_t (*SetInitializedFlag)(METER_REC*, std::int16_t);
    std::int16_t (*GetInsulinName)(METER_REC*, INSULIN_OR_ORAL_MED_NAME_TYPE*);
    std::int16_t (*SetInsulinName)(METER_REC*, INSULIN_OR_ORAL_MED_NAME_TYPE*);
    std::int16_t (*GetOralMedicationName)(METER_REC*, INSULIN_OR_ORAL_MED_NAME_TYPE*);
    std::int16_t (*SetOralMedicationName)(METER_REC*, INSULIN_OR_ORAL_MED_NAME_TYPE*);
    std::int16_t (*GetPredefinedInsulins)(METER_REC*, PREDEFINED_INSULINS_TYPE*);
    std::int16_t (*SetPredefinedInsulins)(METER_REC*, PREDEFINED_INSULINS_TYPE*);
    std::int16_t (*GetPredefinedOralMeds)(METER_REC*, PREDEFINED_ORAL_MEDS_TYPE*);
    std::int16_t (*SetPredefinedOralMeds)(METER_REC*, PREDEFINED_ORAL_MEDS_TYPE*);
    std::int16_t (*GetMealSegments)(METER_REC*, MEAL_SEGMENTS_TYPE*);
    std::int16_t (*SetMealSegments)(METER_REC*, MEAL_SEGMENTS_TYPE*);
    std::int16_t (*GetScheduleSelection)(METER_REC*, std::int16_t*);
    std::int16_t (*SetScheduleSelection)(METER_REC*, std::int16_t);
    std::int16_t (*GetTargetRange)(METER_REC*, std::int16_t*, std::int16_t*, std::int16_t*,
                                   std::int16_t*, std::int16_t*);
    std::int16_t (*SetTargetRange)(METER_REC*, std::int16_t, std::int16_t, std::int16_t,
                                   std::int16_t, std::int16_t);
    std::int16_t (*GetMeterDatalog)(METER_REC*, METER_BIN_DATALOG*, std::int32_t);
    std::int16_t (*GetMeterDatalogRecordData)(METER_BIN_DATALOG*, std::int16_t, RECORD_DATA*);
    std::int16_t (*vb_Upload_Meter_Datalog)(METER_REC*, METER_DATALOG*);
    // Optional extension; nullptr when the library lacks it.
    void (*vx_set_yield_hook)(void (*)(void*), void*);
};

// The transport library as the component calls it.
class Transport {
public:
    virtual ~Transport() = default;

    virtual std::int16_t initialize_meter_structure(METER_REC& rec) = 0;
    virtual std::int16_t find_meter(METER_REC& rec, std::int32_t found[11], std::int16_t ports[11]) = 0;
    virtual std::int16_t initialize_meter_type_structure(METER_REC& rec, std::int16_t type) = 0;
    virtual std::int16_t vb_Chk4Meter(METER_REC& rec) = 0;
    virtual std::int16_t vb_Get_Meter_Firmware(METER_REC& rec) = 0;
    virtual std::int16_t vb_Tickle_Meter(METER_REC& rec) = 0;
    virtual std::int16_t close_meter(METER_REC& rec) = 0;
    virtual std::int16_t vb_Clear_Meter_Datalog(METER_REC& rec) = 0;
    virtual std::int16_t vb_Read_Meter_Options(METER_REC& rec) = 0;
    virtual std::int16_t vb_Read_Meter_Option(METER_REC& rec, std::int16_t option) = 0;
    virtual std::int16_t vb_Set_Meter_Option(METER_REC& rec, std::int16_t option, std::int16_t value) = 0;
    virtual std::int16_t vb_Set_Meter_Options(METER_REC& rec, SETTINGS_REC& settings) = 0;
    virtual std::int16_t vb_Read_Meter_Clock(METER_REC& rec, std::int32_t& seconds) = 0;
    virtual std::int16_t vb_Set_Meter_Clock(METER_REC& rec, std::int32_t seconds) = 0;
    virtual std::int32_t convert_to_seconds(TIME_REC& time) = 0;
    virtual std::int16_t convert_from_seconds(std::int32_t seconds, TIME_REC& time) = 0;
    virtual std::int16_t GetInitializedFlag(METER_REC& rec, std::int16_t& flag) = 0;
    virtual std::int16_t SetInitializedFlag(METER_REC& rec, std::int16_t flag) = 0;
    virtual std::int16_t GetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) = 0;
    virtual std::int16_t SetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) = 0;
    virtual std::int16_t GetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) = 0;
    virtual std::int16_t SetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) = 0;
    virtual std::int16_t GetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) = 0;
    virtual std::int16_t SetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) = 0;
    virtual std::int16_t GetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) = 0;
    virtual std::int16_t SetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) = 0;
    virtual std::int16_t GetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) = 0;
    virtual std::int16_t SetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) = 0;
    virtual std::int16_t GetScheduleSelection(METER_REC& rec, std::int16_t& selection) = 0;
    virtual std::int16_t SetScheduleSelection(METER_REC& rec, std::int16_t selection) = 0;
    virtual std::int16_t GetTargetRange(METER_REC& rec, std::int16_t& befLow, std::int16_t& befHigh,
                                        std::int16_t& aftLow, std::int16_t& aftHigh,
                                        std::int16_t& hypo) = 0;
    virtual std::int16_t SetTargetRange(METER_REC& rec, std::int16_t befLow, std::int16_t befHigh,
                                        std::int16_t aftLow, std::int16_t aftHigh,
                                        std::int16_t hypo) = 0;
    virtual std::int16_t GetMeterDatalog(METER_REC& rec, METER_BIN_DATALOG& datalog,
                                         std::int32_t startSeconds) = 0;
    virtual std::int16_t GetMeterDatalogRecordData(METER_BIN_DATALOG& datalog, std::int16_t index,
                                                   RECORD_DATA& record) = 0;
    virtual std::int16_t vb_Upload_Meter_Datalog(METER_REC& rec, METER_DATALOG& datalog) = 0;
};

// A transport over a library loaded by path on first use; a missing library
// or function raises ComponentError naming it.
std::shared_ptr<Transport> loadTransport(const std::string& path);
// The same over the first of several paths that loads; the error names every path tried.
std::shared_ptr<Transport> loadTransport(std::vector<std::string> candidates);

// A transport over functions already in the process (the statically linked simulator).
std::shared_ptr<Transport> makeTransport(const TransportFunctions& functions);

}  // namespace varnel::detail
