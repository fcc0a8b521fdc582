#pragma once

#include <functional>
#include <memory>
#include <optional>

#include "platform/EventLoop.h"

namespace maroset::platform {

// The real loop, on poll(2) and the monotonic clock. It sleeps in poll() until the next timer
// is due or a descriptor is ready, so an idle host uses no CPU.
//
// A host whose own loop is in charge (asyncio, GLib, Qt) drives this one without a thread:
// it waits for readinessFd() to become readable, or for the time prepareExternalWait()
// answered to pass, then calls pump() and prepareExternalWait() again:
//
//     int fd = loop.readinessFd();                // watched by the host's loop
//     for (;;) {
//         auto wait = loop.prepareExternalWait(); // nullopt: only the descriptor matters
//         hostWait(fd, wait);
//         loop.pump();
//     }
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

    // A descriptor that is readable while a watched descriptor is ready, and after a call is
    // posted or a timer scheduled from outside the loop's own callbacks (what a host's code
    // does between two pumps). Made on first use; owned by the loop.
    int readinessFd();
    // Brings readinessFd() up to date with the watches and returns how long the host may
    // wait before pump() is due: zero when calls are posted, the time to the next timer,
    // nothing when only the descriptor can wake it.
    std::optional<Duration> prepareExternalWait();

    // See LoopCore::setSleepHooks: run around every wait in poll() that may block.
    void setSleepHooks(std::function<void()> enter, std::function<void()> leave);

  private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace maroset::platform
