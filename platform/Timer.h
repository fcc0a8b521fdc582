#pragma once

#include <cstdint>
#include <memory>

#include "lang/Event.h"
#include "platform/EventLoop.h"

namespace maroset::platform {

// A timer control: ticks every Interval milliseconds while Enabled.
// - Enabling it, or setting Interval while enabled, starts the count afresh; disabling and
//   enabling again restarts it too.
// - Interval 0 never ticks, enabled or not.
// - A Tick handler may disable, re-arm or destroy the timer. A tick is never raised while the
//   previous tick's handler is still running (a handler that pumps the loop is not re-entered).
class Timer {
  public:
    explicit Timer(EventLoop& loop);
    ~Timer();
    Timer(const Timer&) = delete;
    Timer& operator=(const Timer&) = delete;

    int32_t Interval() const;
    void Interval(int32_t ms);
    bool Enabled() const;
    void Enabled(bool on);

    Event<> Tick;

  private:
    struct State;
    std::shared_ptr<State> state_;
};

}  // namespace maroset::platform
