// The process's one simulator: the meter it holds, its port, its faults and
// call counts. Every transport call and control takes the lock first.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "simulator.h"
#include "varnel/vantrix32.h"

namespace varnel::sim {
// The caller's yield hook, if it set one.
void yieldToCaller();
// The calling thread's clock: the caller's hook, else the library's own steady clock.
std::uint32_t callerTicks();
void callerSleep(std::uint32_t ms);
// Which clock that is, to notice when the caller hands over another one.
struct CallerClock {
    vx_tick_fn tick = nullptr;
    void* context = nullptr;
    bool operator==(const CallerClock&) const = default;
};
CallerClock callerClock();
}  // namespace varnel::sim

namespace varnel::sim::detail {

// The transport functions that report a status and so can be made to fail.
std::span<const char* const> faultableFunctions();

std::int32_t clockMin(int type);
std::int32_t clockMax(int type);
bool targetsValid(const TargetLimits& limits);

struct Fault {
    std::string function;
    int countdown;  // calls to go; fires at 1
    std::int16_t code;
    bool persistent;
};

class State {
public:
    std::recursive_mutex mutex;

    State() { load(defaultProfile(eMorvex)); }

    // Replaces the meter; faults and counts start afresh. The profile must be valid.
    void load(MeterProfile profile);

    MeterProfile& meter() { return meter_; }
    std::int32_t clock();
    void setClock(std::int32_t seconds);

    bool portOpen = false;

    // Counts the call; returns the code of a fault due now.
    void countCall(const char* function) {
        // Looked up as it is: every call of an upload's record loop comes through here.
        auto it = calls_.find(std::string_view(function));
        if (it == calls_.end()) it = calls_.emplace(function, 0).first;
        ++it->second;
    }
    std::optional<std::int16_t> dueFault(const char* function);
    void addFault(Fault f) { faults_.push_back(std::move(f)); }
    void clearFaults() { faults_.clear(); }
    int calls(const std::string& function) const;

    // Spends the wire time of `bytes` at the meter's speed (plus `extraMs` of
    // meter work) in chunks; after each, progress(fraction) runs, Percent_done
    // advances and the caller's yield hook gets its turn.
    template <class Progress>
    void transfer(METER_REC& rec, std::size_t bytes, std::uint32_t extraMs, Progress progress);

private:
    MeterProfile meter_;
    // The meter clock runs with the calling thread's clock from an anchor.
    std::int32_t clockAtAnchor_ = 0;
    CallerClock anchorClock_;
    std::uint32_t anchorTick_ = 0;
    std::vector<Fault> faults_;
    std::map<std::string, int, std::less<>> calls_;
};

State& state();

template <class Progress>
void State::transfer(METER_REC& rec, std::size_t bytes, std::uint32_t extraMs, Progress progress) {
    constexpr std::uint32_t kChunkMs = 50;
    // Ten bits a byte on the line: start, eight data bits, stop.
    const std::uint64_t total = bytes * 10ull * 1000ull / std::uint64_t(meter_.wireBaud) + extraMs;
    std::uint64_t done = 0;
    rec.Stage = 1;
    rec.Percent_done = 0;
    do {
        const auto step = static_cast<std::uint32_t>(std::min<std::uint64_t>(kChunkMs, total - done));
        callerSleep(step);
        done += step;
        const double fraction = total ? double(done) / double(total) : 1.0;
        progress(fraction);
        rec.Percent_done = static_cast<std::int16_t>(fraction * 100.0);
        yieldToCaller();
    } while (done < total);
    rec.Stage = 0;
}

}  // namespace varnel::sim::detail
