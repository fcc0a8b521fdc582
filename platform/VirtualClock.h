#pragma once

#include "platform/Clock.h"
#include "platform/EventLoop.h"

namespace maroset::platform {

// Wall time that moves with a loop's clock: start + loop.now(). On a virtual loop, advancing
// the loop advances the date and time seen by the error log and its burst rule.
class VirtualClock final : public Clock {
  public:
    VirtualClock(const EventLoop& loop, DateTime start) : loop_(loop), start_(start) {}
    DateTime now() const override { return start_ + loop_.now(); }

  private:
    const EventLoop& loop_;
    DateTime start_;
};

}  // namespace maroset::platform
