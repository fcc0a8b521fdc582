#pragma once

#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/EventLoop.h"

namespace maroset::platform {

// The bookkeeping both loops share: timers, posted calls, watches and the run/stop frames.
// The loops decide what "now" is and how long to wait; LoopCore runs what is due.
//
// Every dispatch step takes a snapshot first, so what a callback schedules or posts runs at a
// later turn (a callback that re-posts itself cannot starve the loop), and each step looks its
// entries up again before calling them, so a callback may cancel, unwatch or destroy anything,
// and a nested pump never calls an entry twice.
class LoopCore {
  public:
    using Duration = EventLoop::Duration;
    using TimerId = EventLoop::TimerId;
    using WatchId = EventLoop::WatchId;

    // One run()/runFor()/advance() on the stack; stop() marks the innermost one.
    class Frame {
      public:
        explicit Frame(LoopCore& core) : core_(core) { core_.frames_.push_back(this); }
        ~Frame() { core_.frames_.pop_back(); }
        Frame(const Frame&) = delete;
        Frame& operator=(const Frame&) = delete;
        bool stopped = false;

      private:
        LoopCore& core_;
    };

    TimerId schedule(Duration due, std::function<void()> fn);
    void cancel(TimerId id);
    void post(std::function<void()> fn);
    WatchId watch(int fd, short events, std::function<void(short)> fn);
    void unwatch(WatchId id);
    void stop();

    bool hasPosted() const { return !posted_.empty(); }
    std::optional<Duration> nextDue() const;
    size_t timerCount() const { return timers_.size(); }

    // The descriptors a poll would wait on now, with their events; fd order, one entry per
    // watch. watchGeneration() changes whenever a watch is added or removed, so a mirror of
    // this set (an epoll instance) knows when to rebuild itself.
    std::vector<std::pair<int, short>> pollSet() const;
    uint64_t watchGeneration() const { return nextWatch_ + removedWatches_; }

    // Called just before and just after a poll that may block (a timeout other than zero),
    // never around callbacks: a host with an interpreter lock releases it only while the
    // loop sleeps. `leave` runs however the poll ends.
    void setSleepHooks(std::function<void()> enter, std::function<void()> leave);

    // Each step below returns early once *stop becomes true (stop may be null: a pump).
    // Runs the calls posted before this step, in order.
    void runPosted(const bool* stop);
    // Runs the timers due at `now` that existed before this step, in due-time order.
    void runDueTimers(Duration now, const bool* stop);
    // Polls the watched descriptors (timeoutMs as poll(2): -1 waits without limit) and calls
    // the ready ones. With nothing watched it just sleeps for the timeout. Returns how many
    // callbacks it called.
    int pollWatches(int timeoutMs, const bool* stop);

  private:
    struct Watch {
        int fd;
        short events;
        std::function<void(short)> fn;
        bool live = true;
        bool running = false;
        // POLLNVAL (descriptor closed under us): reported once, then left out of poll so
        // the loop does not spin on it. unwatch() is still the owner's job.
        bool invalid = false;
        uint64_t lastPass = 0;
    };
    using TimerKey = std::pair<Duration, TimerId>;

    std::map<TimerKey, std::function<void()>> timers_;
    std::unordered_map<TimerId, Duration> dueOf_;
    TimerId nextTimer_ = 1;
    std::deque<std::pair<uint64_t, std::function<void()>>> posted_;
    uint64_t nextPost_ = 1;
    std::map<WatchId, std::shared_ptr<Watch>> watches_;
    WatchId nextWatch_ = 1;
    uint64_t removedWatches_ = 0;
    std::function<void()> sleepEnter_;
    std::function<void()> sleepLeave_;
    uint64_t pollPass_ = 0;
    std::vector<Frame*> frames_;
};

}  // namespace maroset::platform
