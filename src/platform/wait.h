// Waits that keep the thread's messages (and so its timers) running.
#pragma once

#include <atomic>
#include <cstdint>
#include <span>

namespace varnel::detail {

// The wait status of a wait whose time ran out.
inline constexpr std::int32_t waitTimeout = 258;
// The interval of a wait without a time limit.
inline constexpr std::int32_t noTimeLimit = -1;

// An event private to the process (a manual-reset kernel event where the
// system has a message queue). A pulse releases the waits in progress on it
// and leaves nothing behind for a later wait.
class WaitEvent {
public:
    WaitEvent();
    ~WaitEvent();
    WaitEvent(const WaitEvent&) = delete;
    WaitEvent& operator=(const WaitEvent&) = delete;

    void pulse();
    std::uint64_t pulses() const { return pulses_; }
    // The kernel event, or null.
    void* handle() const { return handle_; }

private:
    std::atomic<std::uint64_t> pulses_{0};  // another thread may pulse
    void* handle_;
};

// A wait on the thread clock that lets timer ticks run meanwhile.
class clsWait {
public:
    // Waits until ResumeProcessing; see MsgWaitObj for a wait nothing can end.
    void SuspendProcessing();
    // Waits the seconds (rounded to milliseconds); a negative time does not wait.
    void SleepForSeconds(double seconds);
    // Releases the waits in progress on this object, then lets messages run once.
    void ResumeProcessing();

    // Waits until one of the objects is pulsed (returns its index) or the
    // interval has passed (returns waitTimeout); ticks that arrive meanwhile run
    // and the wait goes on with the time that remains. A wait without a limit
    // that nothing could end (no enabled timer with a handler, and no kernel
    // event another thread could pulse) ends at once as a time-out instead of
    // blocking the thread for good.
    std::int32_t MsgWaitObj(std::int32_t interval, std::span<WaitEvent* const> objects = {});

private:
    WaitEvent event_;
};

// Waits the seconds on the thread's shared clsWait. A time that cannot be
// expressed in milliseconds does not wait; a tick handler's error is raised.
void WaitSeconds(float seconds, bool unused = false);

}  // namespace varnel::detail
