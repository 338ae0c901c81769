// A scripted in-process transport for unit tests: per function a queue of
// return codes (then a default), an effect on the arguments, and a log of
// every call with its by-value arguments and a copy of the meter record.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <deque>
#include <functional>
#include <initializer_list>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "contracts/transport.h"

namespace varnel::test {

// The arguments of one call, for an effect to read or fill; what the function lacks stays null.
struct FakeArgs {
    METER_REC* rec = nullptr;
    std::int32_t* found = nullptr;  // find_meter: 11 entries
    std::int16_t* ports = nullptr;  // find_meter: 11 entries
    SETTINGS_REC* settings = nullptr;
    std::int32_t* seconds = nullptr;  // vb_Read_Meter_Clock
    TIME_REC* time = nullptr;
    std::int16_t* value = nullptr;  // GetInitializedFlag, GetScheduleSelection
    INSULIN_OR_ORAL_MED_NAME_TYPE* name = nullptr;
    PREDEFINED_INSULINS_TYPE* insulins = nullptr;
    PREDEFINED_ORAL_MEDS_TYPE* oralMeds = nullptr;
    MEAL_SEGMENTS_TYPE* segments = nullptr;
    std::array<std::int16_t*, 5> targets{};  // GetTargetRange: befLow, befHigh, aftLow, aftHigh, hypo
    METER_BIN_DATALOG* binDatalog = nullptr;
    RECORD_DATA* record = nullptr;
    METER_DATALOG* datalog = nullptr;
    std::vector<std::int32_t> values{};  // by-value numbers, in argument order
};

// One logged call: the function, its by-value numbers and the record as it came in.
struct FakeCall {
    std::string name;
    std::vector<std::int32_t> values;
    std::optional<METER_REC> rec;
};

class FakeTransport : public detail::Transport {
public:
    struct Script {
        std::deque<std::int32_t> codes;  // used first, one per call
        std::int32_t fallback = 0;
        std::function<void(FakeArgs&)> effect;  // runs before the code is returned
    };

    Script& on(const std::string& function) { return scripts_[function]; }
    FakeTransport& returns(const std::string& function, std::initializer_list<std::int32_t> codes) {
        on(function).codes.insert(on(function).codes.end(), codes);
        return *this;
    }
    FakeTransport& byDefault(const std::string& function, std::int32_t code) {
        on(function).fallback = code;
        return *this;
    }
    FakeTransport& does(const std::string& function, std::function<void(FakeArgs&)> effect) {
        on(function).effect = std::move(effect);
        return *this;
    }

    const std::vector<FakeCall>& calls() const { return calls_; }
    std::vector<std::string> names() const {
        std::vector<std::string> out;
        for (const auto& c : calls_) out.push_back(c.name);
        return out;
    }
    long count(const std::string& function) const {
        return std::count_if(calls_.begin(), calls_.end(), [&](const FakeCall& c) { return c.name == function; });
    }
    void clearLog() { calls_.clear(); }

    std::int16_t initialize_meter_structure(METER_REC& rec) override {
        return run16("initialize_meter_structure", {.rec = &rec});
    }
    std::int16_t find_meter(METER_REC& rec, std::int32_t found[11], std::int16_t ports[11]) override {
        return run16("find_meter", {.rec = &rec, .found = found, .ports = ports});
    }
    std::int16_t initialize_meter_type_structure(METER_REC& rec, std::int16_t type) override {
        return run16("initialize_meter_type_structure", {.rec = &rec, .values = {type}});
    }
    std::int16_t vb_Chk4Meter(METER_REC& rec) override { return run16("vb_Chk4Meter", {.rec = &rec}); }
    std::int16_t vb_Get_Meter_Firmware(METER_REC& rec) override {
        return run16("vb_Get_Meter_Firmware", {.rec = &rec});
    }
    std::int16_t vb_Tickle_Meter(METER_REC& rec) override { return run16("vb_Tickle_Meter", {.rec = &rec}); }
    std::int16_t close_meter(METER_REC& rec) override { return run16("close_meter", {.rec = &rec}); }
    std::int16_t vb_Clear_Meter_Datalog(METER_REC& rec) override {
        return run16("vb_Clear_Meter_Datalog", {.rec = &rec});
    }
    std::int16_t vb_Read_Meter_Options(METER_REC& rec) override {
        return run16("vb_Read_Meter_Options", {.rec = &rec});
    }
    std::int16_t vb_Read_Meter_Option(METER_REC& rec, std::int16_t option) override {
        return run16("vb_Read_Meter_Option", {.rec = &rec, .values = {option}});
    }
    std::int16_t vb_Set_Meter_Option(METER_REC& rec, std::int16_t option, std::int16_t value) override {
        return run16("vb_Set_Meter_Option", {.rec = &rec, .values = {option, value}});
    }
    std::int16_t vb_Set_Meter_Options(METER_REC& rec, SETTINGS_REC& settings) override {
        return run16("vb_Set_Meter_Options", {.rec = &rec, .settings = &settings});
    }
    std::int16_t vb_Read_Meter_Clock(METER_REC& rec, std::int32_t& seconds) override {
        return run16("vb_Read_Meter_Clock", {.rec = &rec, .seconds = &seconds});
    }
    std::int16_t vb_Set_Meter_Clock(METER_REC& rec, std::int32_t seconds) override {
        return run16("vb_Set_Meter_Clock", {.rec = &rec, .values = {seconds}});
    }
    std::int32_t convert_to_seconds(TIME_REC& time) override { return run("convert_to_seconds", {.time = &time}); }
    std::int16_t convert_from_seconds(std::int32_t seconds, TIME_REC& time) override {
        return run16("convert_from_seconds", {.time = &time, .values = {seconds}});
    }
    std::int16_t GetInitializedFlag(METER_REC& rec, std::int16_t& flag) override {
        return run16("GetInitializedFlag", {.rec = &rec, .value = &flag});
    }
    std::int16_t SetInitializedFlag(METER_REC& rec, std::int16_t flag) override {
        return run16("SetInitializedFlag", {.rec = &rec, .values = {flag}});
    }
    std::int16_t GetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return run16("GetInsulinName", {.rec = &rec, .name = &name});
    }
    std::int16_t SetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return run16("SetInsulinName", {.rec = &rec, .name = &name});
    }
    std::int16_t GetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return run16("GetOralMedicationName", {.rec = &rec, .name = &name});
    }
    std::int16_t SetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return run16("SetOralMedicationName", {.rec = &rec, .name = &name});
    }
    std::int16_t GetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) override {
        return run16("GetPredefinedInsulins", {.rec = &rec, .insulins = &v});
    }
    std::int16_t SetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) override {
        return run16("SetPredefinedInsulins", {.rec = &rec, .insulins = &v});
    }
    std::int16_t GetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) override {
        return run16("GetPredefinedOralMeds", {.rec = &rec, .oralMeds = &v});
    }
    std::int16_t SetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) override {
        return run16("SetPredefinedOralMeds", {.rec = &rec, .oralMeds = &v});
    }
    std::int16_t GetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) override {
        return run16("GetMealSegments", {.rec = &rec, .segments = &v});
    }
    std::int16_t SetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) override {
        return run16("SetMealSegments", {.rec = &rec, .segments = &v});
    }
    std::int16_t GetScheduleSelection(METER_REC& rec, std::int16_t& selection) override {
        return run16("GetScheduleSelection", {.rec = &rec, .value = &selection});
    }
    std::int16_t SetScheduleSelection(METER_REC& rec, std::int16_t selection) override {
        return run16("SetScheduleSelection", {.rec = &rec, .values = {selection}});
    }
    std::int16_t GetTargetRange(METER_REC& rec, std::int16_t& befLow, std::int16_t& befHigh,
                                std::int16_t& aftLow, std::int16_t& aftHigh, std::int16_t& hypo) override {
        return run16("GetTargetRange", {.rec = &rec, .targets = {&befLow, &befHigh, &aftLow, &aftHigh, &hypo}});
    }
    std::int16_t SetTargetRange(METER_REC& rec, std::int16_t befLow, std::int16_t befHigh, std::int16_t aftLow,
                                std::int16_t aftHigh, std::int16_t hypo) override {
        return run16("SetTargetRange", {.rec = &rec, .values = {befLow, befHigh, aftLow, aftHigh, hypo}});
    }
    std::int16_t GetMeterDatalog(METER_REC& rec, METER_BIN_DATALOG& datalog, std::int32_t startSeconds) override {
        return run16("GetMeterDatalog", {.rec = &rec, .binDatalog = &datalog, .values = {startSeconds}});
    }
    std::int16_t GetMeterDatalogRecordData(METER_BIN_DATALOG& datalog, std::int16_t index,
                                           RECORD_DATA& record) override {
        return run16("GetMeterDatalogRecordData", {.binDatalog = &datalog, .record = &record, .values = {index}});
    }
    std::int16_t vb_Upload_Meter_Datalog(METER_REC& rec, METER_DATALOG& datalog) override {
        return run16("vb_Upload_Meter_Datalog", {.rec = &rec, .datalog = &datalog});
    }

private:
    std::int32_t run(const char* function, FakeArgs args) {
        FakeCall call{function, args.values, std::nullopt};
        if (args.rec) call.rec = *args.rec;
        calls_.push_back(std::move(call));
        Script& script = scripts_[function];
        if (script.effect) script.effect(args);
        if (script.codes.empty()) return script.fallback;
        const std::int32_t code = script.codes.front();
        script.codes.pop_front();
        return code;
    }
    std::int16_t run16(const char* function, FakeArgs args) {
        return static_cast<std::int16_t>(run(function, std::move(args)));
    }

    std::map<std::string, Script> scripts_;
    std::vector<FakeCall> calls_;
};

}  // namespace varnel::test
