#pragma once

#include <functional>
#include <optional>

#include "platform/EventLoop.h"

namespace maroset::cli {

// Turns SIGINT and SIGTERM into a call on the loop, so that Ctrl-C stops a running command
// cleanly (nodes removed, temporary files gone) instead of killing it. While it lives the two
// signals are blocked and read from a signalfd; the process has one thread, so blocking them
// here blocks them everywhere.
class StopSignal {
  public:
    StopSignal(platform::EventLoop& loop, std::function<void()> onStop);
    ~StopSignal();
    StopSignal(const StopSignal&) = delete;
    StopSignal& operator=(const StopSignal&) = delete;

    bool received() const { return received_; }

  private:
    platform::EventLoop& loop_;
    std::function<void()> onStop_;
    int fd_ = -1;
    std::optional<platform::EventLoop::WatchId> watch_;
    bool received_ = false;
};

}  // namespace maroset::cli
