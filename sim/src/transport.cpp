// The transport library's functions, answered by the simulated meter.
// Failures return a negative code and leave it in the record's Error_code;
// successes leave Error_code alone (the caller may have put an exit code there).
#include <algorithm>
#include <cstring>
#include <ctime>
#include <memory>
#include <new>
#include <optional>

#include "meter_state.h"
#include "varnel/vantrix32.h"

using namespace varnel::sim;
using varnel::sim::detail::State;
using varnel::sim::detail::state;

namespace {

constexpr std::int32_t kPortHandleBase = 0x4000;
constexpr std::size_t kFrameBytes = 32;   // command and acknowledgement of a long operation
constexpr std::size_t kEntryBytes = 16;   // one record-datalog entry on the line
constexpr std::uint32_t kEraseMs = 1500;  // the meter wiping its memory

// Runs one transport call: counts it, refuses missing records, applies a due
// fault (changing nothing else) and records a failure in Error_code.
template <class Body>
std::int16_t call(const char* function, METER_REC* rec, Body body) {
    State& s = state();
    std::lock_guard lock(s.mutex);
    s.countCall(function);
    if (!rec) return ME_BAD_PARAMETER;
    std::int16_t code;
    if (auto fault = s.dueFault(function)) {
        code = *fault;
    } else {
        try {
            code = body(s, *rec);
        } catch (const std::bad_alloc&) {
            code = ME_NOMEM;
        } catch (...) {
            code = ME_FAIL;
        }
    }
    if (code != ME_SUCCESS) rec->Error_code = code;
    return code;
}

// The same for the calls that take no meter record.
template <class Body>
std::int16_t callWithoutRecord(const char* function, Body body) {
    State& s = state();
    std::lock_guard lock(s.mutex);
    s.countCall(function);
    if (auto fault = s.dueFault(function)) return *fault;
    try {
        return body(s);
    } catch (...) {
        return ME_FAIL;
    }
}

// 0 when the meter answers on the record's port.
std::int16_t reach(State& s, const METER_REC& rec) {
    const MeterProfile& m = s.meter();
    if (!m.attached || rec.port.com_number != m.port) return ME_NO_DEVICE;
    s.portOpen = true;
    return ME_SUCCESS;
}

// The calls of the type-7 meter's medication, schedule and target tables.
std::int16_t reachMorvex(State& s, const METER_REC& rec) {
    if (std::int16_t r = reach(s, rec)) return r;
    return s.meter().usesBinaryDatalog() ? ME_SUCCESS : ME_NOT_SUPPORTED;
}

template <std::size_t N>
void putText(std::uint8_t (&field)[N], const std::string& text) {
    std::memset(field, 0, N);
    std::memcpy(field, text.data(), std::min(N, text.size()));
}

template <class T, std::size_t N>
void putList(std::int16_t& count, T (&field)[N], const std::vector<std::int16_t>& values) {
    count = static_cast<std::int16_t>(std::min(N, values.size()));
    std::fill(std::begin(field), std::end(field), T{});
    std::copy_n(values.begin(), count, field);
}

void putOption(SETTINGS_REC& s, int i, const OptionEntry& o) {
    s.Status[i] = o.availability ? 1 : 0;
    s.Availability[i] = o.availability;
    s.nValue[i] = o.availability ? o.value : 0;
    s.nValue_min[i] = o.min;
    s.nValue_max[i] = o.max;
}

void putOptions(SETTINGS_REC& s, const MeterProfile& m) {
    std::memset(&s, 0, sizeof s);
    for (int i = 0; i < kOptionCount; ++i) putOption(s, i, m.options[std::size_t(i)]);
}

// Prepares the record for a meter of this type: the held meter's tables when
// it is of that type, the type's default meter's otherwise.
void prepareType(State& s, METER_REC& rec, std::int16_t type) {
    // The held meter is used in place; only another type's default meter is made.
    std::optional<MeterProfile> other;
    if (s.meter().type != type) other = defaultProfile(type);
    const MeterProfile& m = other ? *other : s.meter();
    rec.M_Type = type;
    putOptions(rec.Setting, m);
    for (int i = 0; i < kOptionCount; ++i) rec.Setting.Status[i] = 0;  // not read from the meter yet
    rec.Checkstrip_range_lower_limit = m.checkStripLow;
    rec.Checkstrip_range_upper_limit = m.checkStripHigh;
    rec.Checkstrip_range_approx = m.checkStripApprox;
    rec.Upper_glucose_report_level = m.glucoseHigh;
    rec.Lower_glucose_report_level = m.glucoseLow;
    rec.Upper_glucose_error_level = m.glucoseErrorHigh;
    rec.Lower_glucose_error_level = m.glucoseErrorLow;
    putList(rec.langMap.numLanguages, rec.langMap.languages, m.languages);
    putList(rec.eventMap.numEvents, rec.eventMap.events, m.events);
    putList(rec.insulinMap.numInsulins, rec.insulinMap.insulins, m.insulinKinds);
    putText(rec.Meter_name, m.name);
    rec.Plasma_cal_flag = m.plasmaCalibrated;
    rec.Time_min = detail::clockMin(type);
    rec.Time_max = detail::clockMax(type);
    rec.Percent_done = 0;
    rec.Stage = 0;
}

// The meter answers who it is and the port is open.
void identify(State& s, METER_REC& rec) {
    const MeterProfile& m = s.meter();
    rec.M_Type = m.type;
    putText(rec.Serial_number, m.identitySerial.empty() ? m.serial : m.identitySerial);
    PORT_REC& p = rec.port;
    p.portStatus = 1;
    p.Id = kPortHandleBase + m.port;
    p.com_number = m.port;
    p.baud_rate = static_cast<std::int16_t>(m.wireBaud);
    p.dcb = dcb{};
    p.dcb.DCBlength = sizeof(dcb);
    p.dcb.BaudRate = m.wireBaud;
    p.dcb.fFlags = 1;  // binary mode
    p.dcb.ByteSize = 8;
    s.portOpen = true;
}

bool valueFits(const MeterProfile& m, int option, std::int16_t value) {
    const OptionEntry& o = m.options[std::size_t(option)];
    if (value < o.min || value > o.max) return false;
    return option != eLanguage || std::find(m.languages.begin(), m.languages.end(), value) != m.languages.end();
}

std::int32_t computerTime() {
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    localtime_r(&now, &local);
    return secondsOf(local.tm_year + 1900, local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min,
                     std::min(local.tm_sec, 59));
}

void stampUpload(State& s, METER_REC& rec) {
    putText(rec.Serial_number, s.meter().serial);
    rec.Meter_upload_time = s.clock();
    rec.Computer_upload_time = computerTime();
}

// Name tables of the type-7 meter.
struct NameTable {
    std::vector<NameSlot> MeterProfile::*slots;
    int firstCustom;
};
constexpr NameTable kInsulins{&MeterProfile::insulinNames, kFirstCustomInsulin};
constexpr NameTable kOralMeds{&MeterProfile::oralMedNames, kFirstCustomOralMed};

std::int16_t getName(State& s, METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name, NameTable table) {
    if (std::int16_t r = reachMorvex(s, rec)) return r;
    const auto& slots = s.meter().*table.slots;
    if (!name || name->index < 1 || name->index > int(slots.size())) return ME_BAD_PARAMETER;
    const NameSlot& slot = slots[std::size_t(name->index - 1)];
    name->notChangeable = slot.fixed ? 1 : 0;
    putText(name->nameStr, slot.bytes);
    return ME_SUCCESS;
}

std::int16_t setName(State& s, METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name, NameTable table) {
    if (std::int16_t r = reachMorvex(s, rec)) return r;
    auto& slots = s.meter().*table.slots;
    if (!name || name->index < table.firstCustom || name->index > int(slots.size())) return ME_BAD_PARAMETER;
    const auto* bytes = reinterpret_cast<const char*>(name->nameStr);
    slots[std::size_t(name->index - 1)].bytes.assign(bytes, strnlen(bytes, sizeof name->nameStr));
    return ME_SUCCESS;
}

template <std::size_t N>
std::int16_t setFavorites(State& s, METER_REC& rec, const std::int16_t* values,
                          std::array<std::int16_t, N> MeterProfile::*favorites, int slots) {
    if (std::int16_t r = reachMorvex(s, rec)) return r;
    if (!values) return ME_BAD_PARAMETER;
    for (std::size_t i = 0; i < N; ++i)
        if (values[i] < 0 || values[i] > slots) return ME_BAD_PARAMETER;
    std::copy_n(values, N, (s.meter().*favorites).begin());
    return ME_SUCCESS;
}

}  // namespace

extern "C" {

VX_API std::int16_t VX_CALL initialize_meter_structure(METER_REC* rec) {
    return call("initialize_meter_structure", rec, [](State&, METER_REC& r) {
        std::memset(&r, 0, sizeof r);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL find_meter(METER_REC* rec, std::int32_t found[11], std::int16_t ports[11]) {
    return call("find_meter", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (!ports) return ME_BAD_PARAMETER;
        if (found) std::fill_n(found, 11, 0);
        const MeterProfile& m = s.meter();
        // The list ends at its first 0 entry.
        for (int i = 0; i < 11 && ports[i] != 0; ++i) {
            if (!m.attached || ports[i] != m.port) continue;
            prepareType(s, r, m.type);
            putOptions(r.Setting, m);
            identify(s, r);
            if (found) found[0] = m.port;
            return ME_SUCCESS;
        }
        return ME_NO_DEVICE;
    });
}

VX_API std::int16_t VX_CALL initialize_meter_type_structure(METER_REC* rec, std::int16_t type) {
    return call("initialize_meter_type_structure", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (type < 1 || type > 8) return ME_BAD_PARAMETER;
        prepareType(s, r, type);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t vb_Chk4Meter(METER_REC* rec) {
    return call("vb_Chk4Meter", rec, [](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reach(s, r)) return c;
        identify(s, r);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Get_Meter_Firmware(METER_REC* rec) {
    return call("vb_Get_Meter_Firmware", rec, [](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reach(s, r)) return c;
        putText(r.Firmware_number, s.meter().firmware);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Tickle_Meter(METER_REC* rec) {
    return call("vb_Tickle_Meter", rec, [](State& s, METER_REC& r) { return reach(s, r); });
}

VX_API std::int16_t VX_CALL close_meter(METER_REC* rec) {
    return call("close_meter", rec, [](State& s, METER_REC& r) {
        if (r.port.com_number == s.meter().port) s.portOpen = false;
        r.port.Id = 0;
        r.port.portStatus = 0;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Clear_Meter_Datalog(METER_REC* rec) {
    return call("vb_Clear_Meter_Datalog", rec, [](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reach(s, r)) return c;
        s.transfer(r, kFrameBytes, kEraseMs, [](double) {});
        MeterProfile& m = s.meter();
        m.datalog.clear();
        m.binaryDatalog.clear();
        m.corruptedRecords.clear();
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Read_Meter_Options(METER_REC* rec) {
    return call("vb_Read_Meter_Options", rec, [](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reach(s, r)) return c;
        putOptions(r.Setting, s.meter());
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Read_Meter_Option(METER_REC* rec, std::int16_t option) {
    return call("vb_Read_Meter_Option", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (option < 0 || option >= kOptionCount) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        const OptionEntry& o = s.meter().options[std::size_t(option)];
        if (o.availability == 0) return ME_NOT_SUPPORTED;
        putOption(r.Setting, option, o);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Set_Meter_Option(METER_REC* rec, std::int16_t option, std::int16_t value) {
    return call("vb_Set_Meter_Option", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (option < 0 || option >= kOptionCount) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        MeterProfile& m = s.meter();
        OptionEntry& o = m.options[std::size_t(option)];
        if (o.availability != 2) return ME_NOT_SUPPORTED;
        if (!valueFits(m, option, value)) return ME_BAD_PARAMETER;
        o.value = value;
        putOption(r.Setting, option, o);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Set_Meter_Options(METER_REC* rec, SETTINGS_REC* settings) {
    return call("vb_Set_Meter_Options", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (!settings) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        MeterProfile& m = s.meter();
        // All or nothing: every value marked for writing is checked first.
        for (int i = 0; i < kOptionCount; ++i) {
            const std::int16_t mark = settings->Availability[i];
            if (mark < 0 || mark > 2) return ME_BAD_PARAMETER;
            if (mark != 2) continue;
            if (m.options[std::size_t(i)].availability != 2) return ME_NOT_SUPPORTED;
            if (!valueFits(m, i, settings->nValue[i])) return ME_BAD_PARAMETER;
        }
        for (int i = 0; i < kOptionCount; ++i)
            if (settings->Availability[i] == 2) m.options[std::size_t(i)].value = settings->nValue[i];
        putOptions(r.Setting, m);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Read_Meter_Clock(METER_REC* rec, std::int32_t* seconds) {
    return call("vb_Read_Meter_Clock", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (!seconds) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        *seconds = s.clock();
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL vb_Set_Meter_Clock(METER_REC* rec, std::int32_t seconds) {
    return call("vb_Set_Meter_Clock", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reach(s, r)) return c;
        const int type = s.meter().type;
        if (seconds < detail::clockMin(type) || seconds > detail::clockMax(type)) return ME_BAD_PARAMETER;
        s.setClock(seconds);
        return ME_SUCCESS;
    });
}

VX_API std::int32_t VX_CALL convert_to_seconds(TIME_REC* time) {
    State& s = state();
    std::lock_guard lock(s.mutex);
    s.countCall("convert_to_seconds");
    return time ? toSeconds(*time) : -1;
}

VX_API std::int16_t VX_CALL convert_from_seconds(std::int32_t seconds, TIME_REC* time) {
    return callWithoutRecord("convert_from_seconds", [&](State&) -> std::int16_t {
        return time && fromSeconds(seconds, *time) ? ME_SUCCESS : ME_BAD_PARAMETER;
    });
}

VX_API std::int16_t VX_CALL GetInitializedFlag(METER_REC* rec, std::int16_t* flag) {
    return call("GetInitializedFlag", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!flag) return ME_BAD_PARAMETER;
        *flag = s.meter().initializedFlag;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL SetInitializedFlag(METER_REC* rec, std::int16_t flag) {
    return call("SetInitializedFlag", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (flag != 0 && flag != 1) return ME_BAD_PARAMETER;
        s.meter().initializedFlag = flag;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL GetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    return call("GetInsulinName", rec, [&](State& s, METER_REC& r) { return getName(s, r, name, kInsulins); });
}

VX_API std::int16_t VX_CALL SetInsulinName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    return call("SetInsulinName", rec, [&](State& s, METER_REC& r) { return setName(s, r, name, kInsulins); });
}

VX_API std::int16_t VX_CALL GetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    return call("GetOralMedicationName", rec, [&](State& s, METER_REC& r) { return getName(s, r, name, kOralMeds); });
}

VX_API std::int16_t VX_CALL SetOralMedicationName(METER_REC* rec, INSULIN_OR_ORAL_MED_NAME_TYPE* name) {
    return call("SetOralMedicationName", rec, [&](State& s, METER_REC& r) { return setName(s, r, name, kOralMeds); });
}

VX_API std::int16_t VX_CALL GetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* insulins) {
    return call("GetPredefinedInsulins", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!insulins) return ME_BAD_PARAMETER;
        std::copy_n(s.meter().favoriteInsulins.begin(), 3, insulins->InsulinType);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL SetPredefinedInsulins(METER_REC* rec, PREDEFINED_INSULINS_TYPE* insulins) {
    return call("SetPredefinedInsulins", rec, [&](State& s, METER_REC& r) {
        return setFavorites(s, r, insulins ? insulins->InsulinType : nullptr, &MeterProfile::favoriteInsulins,
                            kInsulinSlots);
    });
}

VX_API std::int16_t VX_CALL GetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* meds) {
    return call("GetPredefinedOralMeds", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!meds) return ME_BAD_PARAMETER;
        std::copy_n(s.meter().favoriteOralMeds.begin(), 5, meds->oralMedType);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL SetPredefinedOralMeds(METER_REC* rec, PREDEFINED_ORAL_MEDS_TYPE* meds) {
    return call("SetPredefinedOralMeds", rec, [&](State& s, METER_REC& r) {
        return setFavorites(s, r, meds ? meds->oralMedType : nullptr, &MeterProfile::favoriteOralMeds, kOralMedSlots);
    });
}

VX_API std::int16_t VX_CALL GetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* segments) {
    return call("GetMealSegments", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!segments) return ME_BAD_PARAMETER;
        std::copy_n(s.meter().mealSegments.begin(), 7, segments->mealSegments);
        return ME_SUCCESS;
    });
}

// An entry of 0 keeps that segment's start: callers send only the segments they changed.
VX_API std::int16_t VX_CALL SetMealSegments(METER_REC* rec, MEAL_SEGMENTS_TYPE* segments) {
    return call("SetMealSegments", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!segments) return ME_BAD_PARAMETER;
        for (std::int16_t q : segments->mealSegments)
            if (q < 0 || q > 95) return ME_BAD_PARAMETER;
        auto& held = s.meter().mealSegments;
        for (std::size_t i = 0; i < held.size(); ++i)
            if (segments->mealSegments[i] != 0) held[i] = segments->mealSegments[i];
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL GetScheduleSelection(METER_REC* rec, std::int16_t* selection) {
    return call("GetScheduleSelection", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!selection) return ME_BAD_PARAMETER;
        *selection = s.meter().scheduleSelection;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL SetScheduleSelection(METER_REC* rec, std::int16_t selection) {
    return call("SetScheduleSelection", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (selection != 0 && selection != 1) return ME_BAD_PARAMETER;
        s.meter().scheduleSelection = selection;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL GetTargetRange(METER_REC* rec, std::int16_t* befLow, std::int16_t* befHigh, std::int16_t* aftLow,
                                   std::int16_t* aftHigh, std::int16_t* hypo) {
    return call("GetTargetRange", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        if (!befLow || !befHigh || !aftLow || !aftHigh || !hypo) return ME_BAD_PARAMETER;
        const TargetLimits& t = s.meter().targets;
        *befLow = t.beforeLow;
        *befHigh = t.beforeHigh;
        *aftLow = t.afterLow;
        *aftHigh = t.afterHigh;
        *hypo = t.hypo;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL SetTargetRange(METER_REC* rec, std::int16_t befLow, std::int16_t befHigh, std::int16_t aftLow,
                                   std::int16_t aftHigh, std::int16_t hypo) {
    return call("SetTargetRange", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (std::int16_t c = reachMorvex(s, r)) return c;
        const TargetLimits t{befLow, befHigh, aftLow, aftHigh, hypo};
        if (!detail::targetsValid(t)) return ME_BAD_PARAMETER;
        s.meter().targets = t;
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL GetMeterDatalog(METER_REC* rec, METER_BIN_DATALOG* datalog, std::int32_t startSeconds) {
    return call("GetMeterDatalog", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (!datalog) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        const MeterProfile& m = s.meter();
        if (!m.usesBinaryDatalog()) return ME_NOT_SUPPORTED;
        // The records from the start time on. Records the meter knows to be damaged
        // are not sent, only counted: recordCount holds the records delivered.
        std::vector<RECORD_DATA> sent;
        std::int16_t damaged = 0;
        for (std::size_t i = 0; i < m.binaryDatalog.size(); ++i) {
            if (m.binaryDatalog[i].timeStamp < startSeconds) continue;
            if (std::find(m.corruptedRecords.begin(), m.corruptedRecords.end(), int(i)) != m.corruptedRecords.end()) {
                ++damaged;
                continue;
            }
            sent.push_back(m.binaryDatalog[i]);
        }
        auto image = std::make_unique<METER_BIN_DATALOG>();
        encodeBinaryDatalog(sent, *image);
        // Where each record ends in binBuf, to count the records received so far.
        const std::size_t header = encodedSize({});
        std::vector<std::size_t> ends;
        std::size_t end = header + 2 * sent.size();  // header and offset table come first
        ends.reserve(sent.size());
        for (const RECORD_DATA& rd : sent) ends.push_back(end += encodedRecordSize(rd));
        const std::size_t size = encodedSize(sent);

        std::memset(datalog, 0, sizeof *datalog);
        datalog->maxRecordsForMeter = m.maxRecords;
        datalog->corruptedCount = damaged;
        std::size_t copied = 0;
        s.transfer(r, kFrameBytes + size, 0, [&](double fraction) {
            const auto upTo = static_cast<std::size_t>(fraction * double(size));
            std::memcpy(datalog->binBuf + copied, image->binBuf + copied, upTo - copied);
            copied = upTo;
            datalog->recordCount =
                static_cast<std::int16_t>(std::upper_bound(ends.begin(), ends.end(), copied) - ends.begin());
        });
        stampUpload(s, r);
        return ME_SUCCESS;
    });
}

VX_API std::int16_t VX_CALL GetMeterDatalogRecordData(METER_BIN_DATALOG* datalog, std::int16_t index, RECORD_DATA* record) {
    return callWithoutRecord("GetMeterDatalogRecordData", [&](State&) -> std::int16_t {
        if (!datalog || !record) return ME_BAD_PARAMETER;
        return decodeBinaryRecord(*datalog, index, *record);
    });
}

VX_API std::int16_t VX_CALL vb_Upload_Meter_Datalog(METER_REC* rec, METER_DATALOG* datalog) {
    return call("vb_Upload_Meter_Datalog", rec, [&](State& s, METER_REC& r) -> std::int16_t {
        if (!datalog) return ME_BAD_PARAMETER;
        if (std::int16_t c = reach(s, r)) return c;
        const MeterProfile& m = s.meter();
        if (m.usesBinaryDatalog()) return ME_NOT_SUPPORTED;
        const std::vector<data_rec> entries = m.datalog;
        std::memset(datalog, 0, sizeof *datalog);
        datalog->maxRecordsForMeter = m.maxRecords;
        std::size_t received = 0;
        s.transfer(r, kFrameBytes + kEntryBytes * entries.size(), 0, [&](double fraction) {
            const auto upTo = static_cast<std::size_t>(fraction * double(entries.size()));
            for (; received < upTo; ++received) {
                datalog->DataLog[received] = entries[received];
                if (entries[received].Valid == 0) ++datalog->ValidRecordCount;
            }
            datalog->recordCount = static_cast<std::int16_t>(received);
        });
        stampUpload(s, r);
        return ME_SUCCESS;
    });
}

}  // extern "C"
