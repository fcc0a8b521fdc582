#include "platform/Timer.h"

#include "lang/VbError.h"

namespace maroset::platform {

// What the loop's callbacks reach: it outlives the Timer only while a tick is in progress, so
// a handler may destroy the Timer. The Timer cancels its pending tick when it goes, so a
// scheduled callback always finds its State.
struct Timer::State : std::enable_shared_from_this<State> {
    explicit State(EventLoop& l, Timer* t) : loop(l), owner(t) {}

    EventLoop& loop;
    Timer* owner;  // null once the Timer is destroyed
    int32_t interval = 0;
    bool enabled = false;
    bool armed = false;
    EventLoop::TimerId pending = 0;
    bool ticking = false;   // a Tick handler is on the stack
    bool deferred = false;  // a tick fell due while the handler was still running

    void disarm() {
        if (armed) loop.cancel(pending);
        armed = false;
        deferred = false;
    }

    // Starts the count afresh.
    void arm() {
        disarm();
        if (enabled && interval > 0) schedule(EventLoop::Duration(interval));
    }

    void schedule(EventLoop::Duration delay) {
        // A plain pointer keeps the callback small enough for the loop to store it in place.
        pending = loop.schedule(delay, [this] { fire(shared_from_this()); });
        armed = true;
    }

    static void fire(const std::shared_ptr<State>& s) {
        if (!s->owner) return;
        s->armed = false;
        if (!s->enabled || s->interval <= 0) return;
        if (s->ticking) {
            // Never re-enter the handler (it pumped the loop): tick once it returns.
            s->deferred = true;
            return;
        }
        // The next tick is counted from this one, not from the end of the handler.
        s->schedule(EventLoop::Duration(s->interval));
        {
            struct TickScope {
                State& s;
                ~TickScope() { s.ticking = false; }
            } scope{*s};
            s->ticking = true;
            s->owner->Tick.raise();
        }
        if (s->deferred && s->owner && s->enabled && s->interval > 0 && !s->armed) {
            s->deferred = false;
            s->schedule(EventLoop::Duration(0));  // the missed tick, at the next turn
        }
    }
};

Timer::Timer(EventLoop& loop) : state_(std::make_shared<State>(loop, this)) {}

Timer::~Timer() {
    state_->disarm();
    state_->owner = nullptr;
}

int32_t Timer::Interval() const {
    return state_->interval;
}

void Timer::Interval(int32_t ms) {
    // The timer control refuses a negative interval.
    if (ms < 0) throw VbError(err::InvalidPropertyValue);
    state_->interval = ms;
    if (state_->enabled) state_->arm();
}

bool Timer::Enabled() const {
    return state_->enabled;
}

void Timer::Enabled(bool on) {
    // Enabling a timer that already runs keeps its count: restarting takes disable, enable.
    if (on == state_->enabled) return;
    state_->enabled = on;
    if (on)
        state_->arm();
    else
        state_->disarm();
}

}  // namespace maroset::platform
