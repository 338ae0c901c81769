// The thread's message pump and its window timers. There are no threads of
// our own: a timer ticks only on the thread that created it, and only while
// that thread pumps (inside a wait, or while a transport call yields).
#pragma once

#include <cstdint>
#include <exception>
#include <functional>
#include <memory>
#include <optional>

namespace varnel::detail {

struct TimerState;
struct TimerSlot;

// True when this thread's waits and timers run on the system's message queue
// and window timers (Windows, on the real clock); otherwise on the thread clock.
bool onSystemQueue();

// Lets pending window messages run once: the thread's window messages (window
// timers among them), then every timer that is due on the thread clock, at
// most one tick per timer. A handler's error is raised again after the other
// due handlers have run.
void doEvents();

// Milliseconds until the next tick scheduled on the thread clock that has a
// handler to run (0 when one is overdue); empty when none will come.
std::optional<std::uint32_t> msUntilNextTick();

// True when a window timer of the system will deliver a tick with a handler to run.
bool windowTickComing();

// The pump in the shape of a transport yield hook. Errors cannot cross the
// library's C frames, so they are kept until takeYieldError.
void pumpFromTransport(void* context) noexcept;

// The first error a pump inside a transport call kept back, or null; clears it.
std::exception_ptr takeYieldError();

// Keeps one tick handler subscribed for as long as it lives.
class TimerConnection {
public:
    TimerConnection() = default;
    TimerConnection(TimerConnection&& other) noexcept;
    TimerConnection& operator=(TimerConnection&& other) noexcept;
    TimerConnection(const TimerConnection&) = delete;
    TimerConnection& operator=(const TimerConnection&) = delete;
    ~TimerConnection();

    void disconnect();
    bool connected() const;

private:
    friend class TimerControl;
    TimerConnection(std::weak_ptr<TimerState> timer, std::shared_ptr<TimerSlot> slot);

    std::weak_ptr<TimerState> timer_;
    std::shared_ptr<TimerSlot> slot_;
};

// A window timer: while enabled, ticks every interval milliseconds (coalesced
// like window timers: a late pump gives one tick, and the next is one interval
// after it). An interval of 0 never ticks. Enabled on the system's message
// queue it is a window timer of the system, ticking in whatever message loop
// the thread runs; otherwise it is scheduled on the thread clock.
class TimerControl {
public:
    explicit TimerControl(std::uint32_t interval = 0);
    ~TimerControl();
    TimerControl(const TimerControl&) = delete;
    TimerControl& operator=(const TimerControl&) = delete;

    bool enabled() const;
    // Enabling starts the interval now; enabling an enabled timer keeps its schedule.
    void setEnabled(bool on);

    // Subscribes a handler to the tick; it stays subscribed while the connection lives.
    [[nodiscard]] TimerConnection onTick(std::function<void()> handler);

private:
    std::shared_ptr<TimerState> state_;
};

// The hidden form that carries the thread's progress timer.
class TimerForm {
public:
    TimerForm();

    void enableTimer() { tmrStatus_.setEnabled(true); }
    void disableTimer() { tmrStatus_.setEnabled(false); }
    TimerControl& tmrStatus() { return tmrStatus_; }

private:
    TimerControl tmrStatus_;
};

// The calling thread's timer form, created on first use.
TimerForm& frmTimer();

}  // namespace varnel::detail
