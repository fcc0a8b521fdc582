#pragma once

#include <memory>

#include "platform/EventLoop.h"

namespace maroset::platform {

// The real loop, on poll(2) and the monotonic clock. It sleeps in poll() until the next timer
// is due or a descriptor is ready, so an idle host uses no CPU.
class PollEventLoop final : public EventLoop {
  public:
    PollEventLoop();
    ~PollEventLoop() override;

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
