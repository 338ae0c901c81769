// The simulator's state and its C++ controls.
#include <algorithm>
#include <cstring>
#include <type_traits>
#include <vector>

#include "meter_state.h"

namespace varnel::sim {
namespace detail {

namespace {
// Every transport function that reports a status; convert_to_seconds answers seconds instead.
std::vector<const char*> statusFunctions() {
    std::vector<const char*> names;
#define VARNEL_SIM_STATUS_FUNCTION(ret, name, ...) \
    if (std::is_same_v<ret, std::int16_t>) names.push_back(#name);
    VX_METER_FUNCTIONS(VARNEL_SIM_STATUS_FUNCTION)
#undef VARNEL_SIM_STATUS_FUNCTION
    return names;
}
}  // namespace

std::span<const char* const> faultableFunctions() {
    static const std::vector<const char*> names = statusFunctions();
    return names;
}

State& state() {
    static State s;
    return s;
}

void State::load(MeterProfile profile) {
    meter_ = std::move(profile);
    portOpen = false;
    faults_.clear();
    calls_.clear();
    setClock(meter_.clock);
}

std::int32_t State::clock() {
    const CallerClock c = callerClock();
    const std::uint32_t now = callerTicks();
    const auto elapsed = static_cast<std::int32_t>(now - anchorTick_);
    // Another clock (a test's virtual one, another thread's) starts from where the meter stood.
    if (c != anchorClock_ || elapsed < 0) {
        anchorClock_ = c;
        anchorTick_ = now;
        return clockAtAnchor_;
    }
    // Whole seconds move into the anchor, so the time last read is where another clock takes over.
    const std::int32_t seconds = elapsed / 1000;
    clockAtAnchor_ += seconds;
    anchorTick_ += static_cast<std::uint32_t>(seconds) * 1000u;
    return clockAtAnchor_;
}

void State::setClock(std::int32_t seconds) {
    clockAtAnchor_ = seconds;
    anchorClock_ = callerClock();
    anchorTick_ = callerTicks();
    meter_.clock = seconds;
}

std::optional<std::int16_t> State::dueFault(const char* function) {
    for (auto it = faults_.begin(); it != faults_.end(); ++it) {
        if (it->function != function) continue;
        if (it->countdown > 1) {
            --it->countdown;
            continue;
        }
        const std::int16_t code = it->code;
        if (!it->persistent) faults_.erase(it);
        return code;
    }
    return std::nullopt;
}

int State::calls(const std::string& function) const {
    auto it = calls_.find(function);
    return it == calls_.end() ? 0 : it->second;
}

}  // namespace detail

using detail::state;

namespace {
std::unique_lock<std::recursive_mutex> locked() { return std::unique_lock(state().mutex); }
}  // namespace

void loadProfile(const MeterProfile& profile) {
    validateProfile(profile);
    auto lock = locked();
    state().load(profile);
}

void loadProfileFile(const std::string& path) {
    MeterProfile p = readProfileFile(path);
    try {
        validateProfile(p);
    } catch (const std::invalid_argument& e) {
        throw std::runtime_error(path + ": " + e.what());
    }
    auto lock = locked();
    state().load(std::move(p));
}

void reset() { loadProfile(defaultProfile(eMorvex)); }

void selectType(int type) { loadProfile(defaultProfile(type)); }

void attach() {
    auto lock = locked();
    state().meter().attached = true;
}

void detach() {
    auto lock = locked();
    state().meter().attached = false;
    state().portOpen = false;
}

void setSerial(const std::string& serial) {
    if (serial.empty() || serial.size() > 20 || serial.find('\0') != std::string::npos)
        throw std::invalid_argument("a serial number has 1 to 20 characters");
    auto lock = locked();
    state().meter().serial = serial;
}

void setIdentitySerial(const std::string& serial) {
    if (serial.size() > 20 || serial.find('\0') != std::string::npos)
        throw std::invalid_argument("a serial number has at most 20 characters");
    auto lock = locked();
    state().meter().identitySerial = serial;
}

void injectFault(const std::string& function, int nth, std::int16_t code, bool persistent) {
    const auto names = detail::faultableFunctions();
    if (std::find_if(names.begin(), names.end(), [&](const char* n) { return function == n; }) == names.end())
        throw std::invalid_argument("no transport function " + function + " reports a status");
    if (nth < 1) throw std::invalid_argument("the failing call is counted from 1");
    if (code >= 0) throw std::invalid_argument("a failure code is negative");
    auto lock = locked();
    state().addFault({function, nth, code, persistent});
}

void clearFaults() {
    auto lock = locked();
    state().clearFaults();
}

MeterProfile meter() {
    auto lock = locked();
    MeterProfile p = state().meter();
    p.clock = state().clock();
    return p;
}

bool portOpen() {
    auto lock = locked();
    return state().portOpen;
}

int callCount(const std::string& function) {
    auto lock = locked();
    return state().calls(function);
}

std::vector<std::string> faultableFunctions() {
    const auto names = detail::faultableFunctions();
    return {names.begin(), names.end()};
}

}  // namespace varnel::sim
