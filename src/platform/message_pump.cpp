#include "platform/message_pump.h"

#include <algorithm>
#include <utility>
#include <vector>

#include "varnel/clock.h"

namespace varnel::detail {

struct TimerSlot {
    std::function<void()> handler;
    bool live = true;
};

struct TimerState {
    std::uint32_t interval = 0;
    bool enabled = false;
    bool firing = false;  // a tick never re-enters its own handlers
    std::uint32_t due = 0;
    std::vector<std::shared_ptr<TimerSlot>> slots;

    bool canTick() const { return enabled && interval > 0 && !firing; }
    bool hasHandlers() const {
        return std::any_of(slots.begin(), slots.end(), [](const auto& s) { return s->live; });
    }
    void restart() { due = threadClock().tickCount() + interval; }
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

// True when some timer of the thread is due now.
bool anyDue() {
    const std::uint32_t now = threadClock().tickCount();
    for (const auto& t : threadTimers())
        if (auto timer = t.lock(); timer && timer->canTick() && since(timer->due, now) >= 0) return true;
    return false;
}

}  // namespace

void doEvents() {
    // A transport yields often and mostly finds nothing due: look before copying the timer list.
    if (!anyDue()) return;
    std::exception_ptr first;
    for (const auto& timer : liveTimers()) {
        const std::uint32_t now = threadClock().tickCount();
        if (!timer->canTick() || since(timer->due, now) < 0) continue;
        timer->due = now + timer->interval;
        timer->firing = true;
        // Handlers may connect or disconnect while the tick runs.
        const auto slots = timer->slots;
        for (const auto& slot : slots) {
            if (!slot->live) continue;
            try {
                slot->handler();
            } catch (...) {
                if (!first) first = std::current_exception();
            }
        }
        timer->firing = false;
    }
    if (first) std::rethrow_exception(first);
}

std::optional<std::uint32_t> msUntilNextTick() {
    std::optional<std::uint32_t> next;
    const std::uint32_t now = threadClock().tickCount();
    for (const auto& timer : liveTimers()) {
        if (!timer->canTick() || !timer->hasHandlers()) continue;
        const std::int32_t late = since(timer->due, now);
        const std::uint32_t wait = late >= 0 ? 0 : static_cast<std::uint32_t>(-static_cast<std::int64_t>(late));
        next = next ? std::min(*next, wait) : wait;
    }
    return next;
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
    // Connections that outlive the control see it gone; handlers never run again.
    for (const auto& slot : state_->slots) slot->live = false;
}

bool TimerControl::enabled() const { return state_->enabled; }

void TimerControl::setEnabled(bool on) {
    if (on && !state_->enabled) state_->restart();
    state_->enabled = on;
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
