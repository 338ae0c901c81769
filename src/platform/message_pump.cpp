#include "platform/message_pump.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "platform/native.h"
#include "varnel/clock.h"

namespace varnel::detail {

struct TimerSlot {
    std::function<void()> handler;
    bool live = true;
};

struct TimerState {
    std::uint32_t interval = 0;
    bool enabled = false;
    bool firing = false;    // a tick never re-enters its own handlers
    bool windowed = false;  // a window timer of the system delivers the ticks
    std::uint32_t due = 0;
    std::vector<std::shared_ptr<TimerSlot>> slots;

    bool canTick() const { return enabled && interval > 0 && !firing; }
    bool hasHandlers() const {
        return std::any_of(slots.begin(), slots.end(), [](const auto& s) { return s->live; });
    }
    void restart() { due = threadClock().tickCount() + interval; }
    // Scheduled on the thread clock, not by the system's window timer.
    bool byClock() const { return !windowed || !onSystemQueue(); }
    std::uintptr_t id() const { return reinterpret_cast<std::uintptr_t>(this); }
};

namespace {

// The timers this thread owns; only this thread's pump ever sees them.
std::vector<std::weak_ptr<TimerState>>& threadTimers() {
    thread_local std::vector<std::weak_ptr<TimerState>> timers;
    return timers;
}

std::vector<std::shared_ptr<TimerState>> liveTimers() {
    auto& timers = threadTimers();
    std::erase_if(timers, [](const auto& t) { return t.expired(); });
    std::vector<std::shared_ptr<TimerState>> live;
    for (const auto& t : timers)
        if (auto s = t.lock()) live.push_back(std::move(s));
    return live;
}

// Signed distance on the wrapping tick count: negative while `due` is ahead.
std::int32_t since(std::uint32_t due, std::uint32_t now) { return static_cast<std::int32_t>(now - due); }

thread_local std::exception_ptr t_yieldError;

}  // namespace

namespace {

// True when some clock-scheduled timer of the thread is due now.
bool anyDue() {
    const std::uint32_t now = threadClock().tickCount();
    for (const auto& t : threadTimers())
        if (auto timer = t.lock(); timer && timer->canTick() && timer->byClock() && since(timer->due, now) >= 0)
            return true;
    return false;
}

// One tick: every live handler runs; the first error is kept in `first`.
void fire(TimerState& timer, std::exception_ptr& first) {
    timer.due = threadClock().tickCount() + timer.interval;
    timer.firing = true;
    // Handlers may connect or disconnect while the tick runs.
    const auto slots = timer.slots;
    for (const auto& slot : slots) {
        if (!slot->live) continue;
        try {
            slot->handler();
        } catch (...) {
            if (!first) first = std::current_exception();
        }
    }
    timer.firing = false;
}

}  // namespace

void tickWindowTimer(std::uintptr_t id) noexcept {
    if (!onSystemQueue()) return;  // the thread clock schedules the ticks meanwhile
    for (const auto& timer : liveTimers())
        if (timer->id() == id && timer->windowed && timer->canTick()) {
            // The error cannot cross the system's message dispatch: it waits for the pump or the transport call.
            try {
                std::exception_ptr first;
                fire(*timer, first);
                if (first && !t_yieldError) t_yieldError = first;
            } catch (...) {
                if (!t_yieldError) t_yieldError = std::current_exception();
            }
        }
}

void doEvents() {
    native::runPendingMessages();
    std::exception_ptr first = takeYieldError();
    // A transport yields often and mostly finds nothing due: look before copying the timer list.
    if (anyDue()) {
        for (const auto& timer : liveTimers()) {
            if (!timer->canTick() || !timer->byClock() || since(timer->due, threadClock().tickCount()) < 0) continue;
            fire(*timer, first);
        }
    }
    if (first) std::rethrow_exception(first);
}

std::optional<std::uint32_t> msUntilNextTick() {
    std::optional<std::uint32_t> next;
    const std::uint32_t now = threadClock().tickCount();
    for (const auto& timer : liveTimers()) {
        if (!timer->canTick() || !timer->byClock() || !timer->hasHandlers()) continue;
        const std::int32_t late = since(timer->due, now);
        const std::uint32_t wait = late >= 0 ? 0 : static_cast<std::uint32_t>(-static_cast<std::int64_t>(late));
        next = next ? std::min(*next, wait) : wait;
    }
    return next;
}

bool windowTickComing() {
    for (const auto& timer : liveTimers())
        if (timer->canTick() && !timer->byClock() && timer->hasHandlers()) return true;
    return false;
}

void pumpFromTransport(void*) noexcept {
    try {
        doEvents();
    } catch (...) {
        if (!t_yieldError) t_yieldError = std::current_exception();
    }
}

std::exception_ptr takeYieldError() { return std::exchange(t_yieldError, nullptr); }

TimerConnection::TimerConnection(std::weak_ptr<TimerState> timer, std::shared_ptr<TimerSlot> slot)
    : timer_(std::move(timer)), slot_(std::move(slot)) {}

TimerConnection::TimerConnection(TimerConnection&& other) noexcept
    : timer_(std::move(other.timer_)), slot_(std::move(other.slot_)) {}

TimerConnection& TimerConnection::operator=(TimerConnection&& other) noexcept {
    if (this != &other) {
        disconnect();
        timer_ = std::move(other.timer_);
        slot_ = std::move(other.slot_);
    }
    return *this;
}

TimerConnection::~TimerConnection() { disconnect(); }

void TimerConnection::disconnect() {
    if (!slot_) return;
    slot_->live = false;
    if (auto timer = timer_.lock()) std::erase(timer->slots, slot_);
    slot_.reset();
    timer_.reset();
}

bool TimerConnection::connected() const { return slot_ && !timer_.expired(); }

TimerControl::TimerControl(std::uint32_t interval) : state_(std::make_shared<TimerState>()) {
    state_->interval = interval;
    threadTimers().push_back(state_);
}

TimerControl::~TimerControl() {
    if (state_->windowed) native::stopWindowTimer(state_->id());
    // Connections that outlive the control see it gone; handlers never run again.
    for (const auto& slot : state_->slots) slot->live = false;
}

bool TimerControl::enabled() const { return state_->enabled; }

void TimerControl::setEnabled(bool on) {
    TimerState& s = *state_;
    if (on && !s.enabled) {
        s.restart();
        s.windowed = s.interval > 0 && onSystemQueue() && native::startWindowTimer(s.id(), s.interval);
    } else if (!on && s.windowed) {
        native::stopWindowTimer(s.id());
        s.windowed = false;
    }
    s.enabled = on;
}

TimerConnection TimerControl::onTick(std::function<void()> handler) {
    auto slot = std::make_shared<TimerSlot>();
    slot->handler = std::move(handler);
    state_->slots.push_back(slot);
    return TimerConnection(state_, std::move(slot));
}

TimerForm::TimerForm() : tmrStatus_(400) {}

TimerForm& frmTimer() {
    thread_local TimerForm form;
    return form;
}

}  // namespace varnel::detail
