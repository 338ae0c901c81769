/**
 * @file clock.h
 * The clock every wait and timer of the component (and of the simulated meters) goes through.
 */
#pragma once

#include <cstdint>
#include <memory>

#include "export.h"

namespace varnel {

/**
 * A millisecond tick source that can also sleep.
 *
 * Each thread has one (threadClock()); every wait and timer tick of the
 * component, and of a transport library that takes the component's clock,
 * reads it. Install a ManualClock with setThreadClock() to run requests in
 * virtual time.
 */
class VARNEL_API Clock {
public:
    virtual ~Clock();
    /// Milliseconds since an arbitrary start, wrapping at 2^32.
    virtual std::uint32_t tickCount() = 0;
    /// Blocks (or, for a virtual clock, advances) for `ms` milliseconds.
    virtual void sleep(std::uint32_t ms) = 0;
};

/// Virtual time for tests: nothing ever waits for real; time passes only by sleep() and advance().
class VARNEL_API ManualClock : public Clock {
public:
    /// A clock that reads `start` until it is advanced.
    explicit ManualClock(std::uint32_t start = 0) : now_(start) {}
    /// The virtual time.
    std::uint32_t tickCount() override { return now_; }
    /// Advances the virtual time by `ms` at once.
    void sleep(std::uint32_t ms) override { now_ += ms; }
    /// Advances the virtual time by `ms`, as time passing outside a wait would.
    void advance(std::uint32_t ms) { now_ += ms; }

private:
    std::uint32_t now_;
};

/// Replaces the calling thread's clock; nullptr restores the real clock.
VARNEL_API void setThreadClock(std::shared_ptr<Clock> clock);

/// The calling thread's clock (the real clock unless one was set).
VARNEL_API Clock& threadClock();

}  // namespace varnel
