#pragma once

#include <memory>

#include "platform/EventLoop.h"

namespace maroset::platform {

// A loop on a virtual clock, for tests: time moves only when advance() (or runFor()) moves it,
// firing due timers in time order, each at its own due time, so a test of a five-second
// watchdog runs in microseconds. Watched descriptors are polled without waiting at each turn.
// run() advances time to each next timer until stop() or nothing is left to do.
class VirtualEventLoop final : public EventLoop {
  public:
    VirtualEventLoop();
    ~VirtualEventLoop() override;

    // Moves time forward by d, running everything that falls due on the way.
    void advance(Duration d);
    // Number of timers still scheduled.
    size_t pendingTimers() const;

    Duration now() const override;
    TimerId schedule(Duration delay, std::function<void()> fn) override;
    void cancel(TimerId id) override;
    void post(std::function<void()> fn) override;
    WatchId watch(int fd, short events, std::function<void(short)> fn) override;
    void unwatch(WatchId id) override;
    void pump() override;
    void run() override;
    void runFor(Duration d) override;
    void stop() override;

  private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace maroset::platform
