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
    METER_REC* rec = nullptr;          // null for the functions without one
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

    // Every meter function logs its call and runs its script.
#define VARNEL_FAKE_ARG(kind, type, name) , VARNEL_FAKE_ARG_##kind(name)
#define VARNEL_FAKE_ARG_REC(name) Rec{&name}
#define VARNEL_FAKE_ARG_VALUE(name) \
    Value { name }
#define VARNEL_FAKE_ARG_IN(name) name
#define VARNEL_FAKE_ARG_OUT(name) name
#define VARNEL_FAKE_ARG_INOUT(name) name
#define VARNEL_FAKE_ARG_IN_LIST(name) *name  // a list by its first entry
#define VARNEL_FAKE_ARG_OUT_LIST(name) *name
#define VARNEL_FAKE_MEMBER(ret, name, ...) \
    ret name(VARNEL_CXX_PARAMS(__VA_ARGS__)) override { return run<ret>(#name VX_EACH(VARNEL_FAKE_ARG, __VA_ARGS__)); }
    VX_METER_FUNCTIONS(VARNEL_FAKE_MEMBER)
#undef VARNEL_FAKE_MEMBER

private:
    // How each argument is logged: the record by copy, numbers by value, the rest as typed references.
    struct Rec {
        METER_REC* rec;
    };
    struct Value {
        std::int32_t value;
    };
    static void take(FakeArgs& a, Rec r) { a.rec = r.rec; }
    static void take(FakeArgs& a, Value v) { a.values.push_back(v.value); }
    template <class T>
    static void take(FakeArgs& a, T& ref) {
        a.refs.emplace_back(&typeid(T), static_cast<void*>(&ref));
    }

    template <class R, class... Args>
    R run(const char* function, Args&&... args) {
        FakeArgs call;
        (take(call, args), ...);
        calls_.push_back({function, call.values, call.rec ? std::optional(*call.rec) : std::nullopt});
        if (auto effect = effects_.find(function); effect != effects_.end()) effect->second(call);
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
