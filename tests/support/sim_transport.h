// The statically linked simulator as a transport, for tests that run whole requests.
#pragma once

#include <memory>

#include "contracts/transport.h"
#include "varnel/vantrix32.h"

namespace varnel::test {

inline std::shared_ptr<detail::Transport> simTransport() {
    return detail::makeTransport({
        .initialize_meter_structure = &::initialize_meter_structure,
        .find_meter = &::find_meter,
        .initialize_meter_type_structure = &::initialize_meter_type_structure,
        .vb_Chk4Meter = &::vb_Chk4Meter,
        .vb_Get_Meter_Firmware = &::vb_Get_Meter_Firmware,
        .vb_Tickle_Meter = &::vb_Tickle_Meter,
        .close_meter = &::close_meter,
        .vb_Clear_Meter_Datalog = &::vb_Clear_Meter_Datalog,
        .vb_Read_Meter_Options = &::vb_Read_Meter_Options,
        .vb_Read_Meter_Option = &::vb_Read_Meter_Option,
        .vb_Set_Meter_Option = &::vb_Set_Meter_Option,
        .vb_Set_Meter_Options = &::vb_Set_Meter_Options,
        .vb_Read_Meter_Clock = &::vb_Read_Meter_Clock,
        .vb_Set_Meter_Clock = &::vb_Set_Meter_Clock,
        .convert_to_seconds = &::convert_to_seconds,
        .convert_from_seconds = &::convert_from_seconds,
        .GetInitializedFlag = &::GetInitializedFlag,
        .SetInitializedFlag = &::SetInitializedFlag,
        .GetInsulinName = &::GetInsulinName,
        .SetInsulinName = &::SetInsulinName,
        .GetOralMedicationName = &::GetOralMedicationName,
        .SetOralMedicationName = &::SetOralMedicationName,
        .GetPredefinedInsulins = &::GetPredefinedInsulins,
        .SetPredefinedInsulins = &::SetPredefinedInsulins,
        .GetPredefinedOralMeds = &::GetPredefinedOralMeds,
        .SetPredefinedOralMeds = &::SetPredefinedOralMeds,
        .GetMealSegments = &::GetMealSegments,
        .SetMealSegments = &::SetMealSegments,
        .GetScheduleSelection = &::GetScheduleSelection,
        .SetScheduleSelection = &::SetScheduleSelection,
        .GetTargetRange = &::GetTargetRange,
        .SetTargetRange = &::SetTargetRange,
        .GetMeterDatalog = &::GetMeterDatalog,
        .GetMeterDatalogRecordData = &::GetMeterDatalogRecordData,
        .vb_Upload_Meter_Datalog = &::vb_Upload_Meter_Datalog,
        .vx_set_yield_hook = &::vx_set_yield_hook,
    });
}

}  // namespace varnel::test
