#pragma once

#include <functional>
#include <utility>

namespace maroset {

// A handle on one event handler: the handler stays subscribed while the handle lives, and is
// unsubscribed when the handle is destroyed or reset. Safe to destroy after the event's
// source is gone.
class Subscription {
  public:
    Subscription() = default;
    explicit Subscription(std::function<void()> cancel) : cancel_(std::move(cancel)) {}
    Subscription(Subscription&& other) noexcept : cancel_(std::exchange(other.cancel_, {})) {}
    Subscription& operator=(Subscription&& other) noexcept {
        if (this != &other) {
            reset();
            cancel_ = std::exchange(other.cancel_, {});
        }
        return *this;
    }
    Subscription(const Subscription&) = delete;
    Subscription& operator=(const Subscription&) = delete;
    ~Subscription() { reset(); }

    void reset() noexcept {
        if (auto cancel = std::exchange(cancel_, {})) cancel();
    }
    explicit operator bool() const noexcept { return static_cast<bool>(cancel_); }

  private:
    std::function<void()> cancel_;
};

}  // namespace maroset
