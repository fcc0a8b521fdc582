#pragma once

#include <algorithm>
#include <functional>
#include <memory>
#include <vector>

#include "lang/Subscription.h"

namespace maroset {

// A synchronous multicast event: raise() calls every subscribed handler, in the order they
// subscribed, before it returns.
//
// What a handler may do while the event is being raised:
// - unsubscribe itself or any other handler: a handler unsubscribed before its turn is not
//   called;
// - subscribe new handlers: they are called from the next raise on;
// - destroy the object that owns the event: the raise finishes with the handlers it had.
// Errors thrown by a handler propagate to the raiser; the remaining handlers are not called.
template <class... Args>
class Event {
  public:
    using Handler = std::function<void(Args...)>;

    Event() = default;
    Event(const Event&) = delete;
    Event& operator=(const Event&) = delete;

    [[nodiscard]] Subscription subscribe(Handler handler) {
        auto slot = std::make_shared<Slot>(Slot{std::move(handler), true});
        state_->slots.push_back(slot);
        return Subscription([weak = std::weak_ptr<State>(state_), slot] {
            slot->live = false;
            if (auto state = weak.lock()) state->release(slot.get());
        });
    }

    void raise(Args... args) const {
        const std::shared_ptr<State> state = state_;  // outlives a handler that destroys us
        RaiseScope scope(*state);
        const size_t count = state->slots.size();
        for (size_t i = 0; i < count; ++i) {
            Slot& slot = *state->slots[i];
            if (slot.live) slot.handler(args...);
        }
    }

    size_t handlerCount() const {
        return static_cast<size_t>(std::count_if(state_->slots.begin(), state_->slots.end(),
                                                 [](const auto& s) { return s->live; }));
    }

  private:
    struct Slot {
        Handler handler;
        bool live;
    };
    struct State {
        std::vector<std::shared_ptr<Slot>> slots;
        int raising = 0;
        bool stale = false;

        void release(Slot* slot) {
            if (raising > 0) {
                stale = true;  // removed once the outermost raise is done
                return;
            }
            std::erase_if(slots, [slot](const auto& s) { return s.get() == slot; });
        }
        void compact() {
            std::erase_if(slots, [](const auto& s) { return !s->live; });
            stale = false;
        }
    };
    struct RaiseScope {
        explicit RaiseScope(State& s) : state(s) { ++state.raising; }
        ~RaiseScope() {
            if (--state.raising == 0 && state.stale) state.compact();
        }
        State& state;
    };

    std::shared_ptr<State> state_ = std::make_shared<State>();
};

}  // namespace maroset
