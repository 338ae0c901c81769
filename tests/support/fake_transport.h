// A scripted in-process transport for unit tests: per function a queue of
// return codes (0 once it runs out), an effect on the arguments, and a log of
// every call with its by-value numbers and a copy of the meter record.
#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <initializer_list>
#include <map>
#include <optional>
#include <stdexcept>
#include <string>
#include <typeinfo>
#include <vector>

#include "contracts/transport.h"

namespace varnel::test {

// The arguments of one call, for an effect to read or fill.
struct FakeArgs {
    METER_REC* rec = nullptr;  // null for the functions without one
    std::vector<std::int32_t> values;  // by-value numbers, in argument order
    std::vector<std::pair<const std::type_info*, void*>> refs;

    // The i-th by-reference argument of type T (find_meter's arrays by their first entry).
    template <class T>
    T& ref(std::size_t i = 0) const {
        for (const auto& [type, p] : refs)
            if (*type == typeid(T) && i-- == 0) return *static_cast<T*>(p);
        throw std::logic_error(std::string("the call has no such argument of type ") + typeid(T).name());
    }
};

// One logged call: the function, its by-value numbers and the record as it came in.
struct FakeCall {
    std::string name;
    std::vector<std::int32_t> values;
    std::optional<METER_REC> rec;
};

class FakeTransport : public detail::Transport {
public:
    FakeTransport& returns(const std::string& function, std::initializer_list<std::int32_t> codes) {
        codes_[function].insert(codes_[function].end(), codes);
        return *this;
    }
    // The effect runs before the code is returned.
    FakeTransport& does(const std::string& function, std::function<void(FakeArgs&)> effect) {
        effects_[function] = std::move(effect);
        return *this;
    }

    const std::vector<FakeCall>& calls() const { return calls_; }
    std::vector<std::string> names() const {
        std::vector<std::string> out;
        for (const auto& c : calls_) out.push_back(c.name);
        return out;
    }
    void clearLog() { calls_.clear(); }

    using I16 = std::int16_t;
    I16 initialize_meter_structure(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 find_meter(METER_REC& r, std::int32_t found[11], I16 ports[11]) override {
        return run(__func__, &r, {}, *found, *ports);
    }
    I16 initialize_meter_type_structure(METER_REC& r, I16 type) override { return run(__func__, &r, {type}); }
    I16 vb_Chk4Meter(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 vb_Get_Meter_Firmware(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 vb_Tickle_Meter(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 close_meter(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 vb_Clear_Meter_Datalog(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 vb_Read_Meter_Options(METER_REC& r) override { return run(__func__, &r, {}); }
    I16 vb_Read_Meter_Option(METER_REC& r, I16 option) override { return run(__func__, &r, {option}); }
    I16 vb_Set_Meter_Option(METER_REC& r, I16 option, I16 v) override { return run(__func__, &r, {option, v}); }
    I16 vb_Set_Meter_Options(METER_REC& r, SETTINGS_REC& s) override { return run(__func__, &r, {}, s); }
    I16 vb_Read_Meter_Clock(METER_REC& r, std::int32_t& seconds) override { return run(__func__, &r, {}, seconds); }
    I16 vb_Set_Meter_Clock(METER_REC& r, std::int32_t seconds) override { return run(__func__, &r, {seconds}); }
    std::int32_t convert_to_seconds(TIME_REC& t) override { return run<std::int32_t>(__func__, nullptr, {}, t); }
    I16 convert_from_seconds(std::int32_t s, TIME_REC& t) override { return run(__func__, nullptr, {s}, t); }
    I16 GetInitializedFlag(METER_REC& r, I16& flag) override { return run(__func__, &r, {}, flag); }
    I16 SetInitializedFlag(METER_REC& r, I16 flag) override { return run(__func__, &r, {flag}); }
    I16 GetInsulinName(METER_REC& r, INSULIN_OR_ORAL_MED_NAME_TYPE& n) override { return run(__func__, &r, {}, n); }
    I16 SetInsulinName(METER_REC& r, INSULIN_OR_ORAL_MED_NAME_TYPE& n) override { return run(__func__, &r, {}, n); }
    I16 GetOralMedicationName(METER_REC& r, INSULIN_OR_ORAL_MED_NAME_TYPE& n) override {
        return run(__func__, &r, {}, n);
    }
    I16 SetOralMedicationName(METER_REC& r, INSULIN_OR_ORAL_MED_NAME_TYPE& n) override {
        return run(__func__, &r, {}, n);
    }
    I16 GetPredefinedInsulins(METER_REC& r, PREDEFINED_INSULINS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 SetPredefinedInsulins(METER_REC& r, PREDEFINED_INSULINS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 GetPredefinedOralMeds(METER_REC& r, PREDEFINED_ORAL_MEDS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 SetPredefinedOralMeds(METER_REC& r, PREDEFINED_ORAL_MEDS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 GetMealSegments(METER_REC& r, MEAL_SEGMENTS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 SetMealSegments(METER_REC& r, MEAL_SEGMENTS_TYPE& v) override { return run(__func__, &r, {}, v); }
    I16 GetScheduleSelection(METER_REC& r, I16& selection) override { return run(__func__, &r, {}, selection); }
    I16 SetScheduleSelection(METER_REC& r, I16 selection) override { return run(__func__, &r, {selection}); }
    // The five limits in argument order: before-meal low, high, after-meal low, high, hypo.
    I16 GetTargetRange(METER_REC& r, I16& a, I16& b, I16& c, I16& d, I16& e) override {
        return run(__func__, &r, {}, a, b, c, d, e);
    }
    I16 SetTargetRange(METER_REC& r, I16 a, I16 b, I16 c, I16 d, I16 e) override {
        return run(__func__, &r, {a, b, c, d, e});
    }
    I16 GetMeterDatalog(METER_REC& r, METER_BIN_DATALOG& log, std::int32_t start) override {
        return run(__func__, &r, {start}, log);
    }
    I16 GetMeterDatalogRecordData(METER_BIN_DATALOG& log, I16 index, RECORD_DATA& record) override {
        return run(__func__, nullptr, {index}, log, record);
    }
    I16 vb_Upload_Meter_Datalog(METER_REC& r, METER_DATALOG& log) override { return run(__func__, &r, {}, log); }

private:
    template <class R = I16, class... Refs>
    R run(const char* function, METER_REC* rec, std::vector<std::int32_t> values, Refs&... refs) {
        calls_.push_back({function, values, rec ? std::optional(*rec) : std::nullopt});
        FakeArgs args{rec, std::move(values), {{&typeid(Refs), static_cast<void*>(&refs)}...}};
        if (auto effect = effects_.find(function); effect != effects_.end()) effect->second(args);
        std::deque<std::int32_t>& queue = codes_[function];
        if (queue.empty()) return 0;
        const std::int32_t code = queue.front();
        queue.pop_front();
        return static_cast<R>(code);
    }

    std::map<std::string, std::deque<std::int32_t>> codes_;
    std::map<std::string, std::function<void(FakeArgs&)>> effects_;
    std::vector<FakeCall> calls_;
};

}  // namespace varnel::test
