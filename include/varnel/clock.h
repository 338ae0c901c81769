// The clock every wait and timer of the component (and of the simulated meters) goes through.
#pragma once

#include <cstdint>
#include <memory>

#include "export.h"

namespace varnel {

// A millisecond tick source that can also sleep.
class VARNEL_API Clock {
public:
    virtual ~Clock();
    // Milliseconds since an arbitrary start, wrapping at 2^32.
    virtual std::uint32_t tickCount() = 0;
    // Blocks (or, for a virtual clock, advances) for ms milliseconds.
    virtual void sleep(std::uint32_t ms) = 0;
};

// Virtual time for tests: nothing ever waits for real.
class VARNEL_API ManualClock : public Clock {
public:
    explicit ManualClock(std::uint32_t start = 0) : now_(start) {}
    std::uint32_t tickCount() override { return now_; }
    void sleep(std::uint32_t ms) override { now_ += ms; }
    void advance(std::uint32_t ms) { now_ += ms; }

private:
    std::uint32_t now_;
};

// Replaces the calling thread's clock; nullptr restores the real clock.
VARNEL_API void setThreadClock(std::shared_ptr<Clock> clock);

// The calling thread's clock (the real clock unless one was set).
VARNEL_API Clock& threadClock();

}  // namespace varnel
