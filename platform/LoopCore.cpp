#include "platform/LoopCore.h"

#include <poll.h>

#include <cerrno>
#include <system_error>

namespace maroset::platform {

namespace {

// Clears a "callback on the stack" flag however the callback leaves.
class RunningScope {
  public:
    explicit RunningScope(bool& flag) : flag_(flag) { flag_ = true; }
    ~RunningScope() { flag_ = false; }
    RunningScope(const RunningScope&) = delete;
    RunningScope& operator=(const RunningScope&) = delete;

  private:
    bool& flag_;
};

bool stopped(const bool* stop) {
    return stop != nullptr && *stop;
}

}  // namespace

LoopCore::TimerId LoopCore::schedule(Duration due, std::function<void()> fn) {
    const TimerId id = nextTimer_++;
    timers_.emplace(TimerKey{due, id}, std::move(fn));
    dueOf_.emplace(id, due);
    return id;
}

void LoopCore::cancel(TimerId id) {
    auto it = dueOf_.find(id);
    if (it == dueOf_.end()) return;
    timers_.erase(TimerKey{it->second, id});
    dueOf_.erase(it);
}

void LoopCore::post(std::function<void()> fn) {
    posted_.emplace_back(nextPost_++, std::move(fn));
}

LoopCore::WatchId LoopCore::watch(int fd, short events, std::function<void(short)> fn) {
    const WatchId id = nextWatch_++;
    auto w = std::make_shared<Watch>();
    w->fd = fd;
    w->events = events;
    w->fn = std::move(fn);
    watches_.emplace(id, std::move(w));
    return id;
}

void LoopCore::unwatch(WatchId id) {
    auto it = watches_.find(id);
    if (it == watches_.end()) return;
    it->second->live = false;  // a dispatch in progress holds its own reference
    watches_.erase(it);
    ++removedWatches_;
}

void LoopCore::stop() {
    if (!frames_.empty()) frames_.back()->stopped = true;
}

std::optional<LoopCore::Duration> LoopCore::nextDue() const {
    if (timers_.empty()) return std::nullopt;
    return timers_.begin()->first.first;
}

std::vector<std::pair<int, short>> LoopCore::pollSet() const {
    std::vector<std::pair<int, short>> set;
    for (const auto& [id, w] : watches_) {
        if (!w->running && !w->invalid) set.emplace_back(w->fd, w->events);
    }
    return set;
}

void LoopCore::setSleepHooks(std::function<void()> enter, std::function<void()> leave) {
    sleepEnter_ = std::move(enter);
    sleepLeave_ = std::move(leave);
}

void LoopCore::runPosted(const bool* stop) {
    if (posted_.empty()) return;
    // Calls posted while these run wait for the next turn.
    const uint64_t last = posted_.back().first;
    while (!posted_.empty() && posted_.front().first <= last && !stopped(stop)) {
        std::function<void()> fn = std::move(posted_.front().second);
        posted_.pop_front();
        fn();
    }
}

void LoopCore::runDueTimers(Duration now, const bool* stop) {
    // Only timers that existed before this step run in it: ids grow, so a timer scheduled by
    // a callback here has an id at or above `limit` and waits for a later step. The map is
    // looked at afresh after each callback, which may cancel, schedule or run anything.
    const TimerId limit = nextTimer_;
    while (!stopped(stop)) {
        auto it = timers_.begin();
        while (it != timers_.end() && it->first.first <= now && it->first.second >= limit) ++it;
        if (it == timers_.end() || it->first.first > now) return;
        // The callback lives here while it runs, so it may destroy whatever scheduled it.
        std::function<void()> fn = std::move(it->second);
        dueOf_.erase(it->first.second);
        timers_.erase(it);
        fn();
    }
}

int LoopCore::pollWatches(int timeoutMs, const bool* stop) {
    std::vector<pollfd> fds;
    std::vector<std::shared_ptr<Watch>> ready;
    for (const auto& [id, w] : watches_) {
        // A watch whose callback is on the stack is left out, so a nested pump neither
        // re-enters it nor wakes up for it again and again.
        if (w->running || w->invalid) continue;
        fds.push_back(pollfd{w->fd, w->events, 0});
        ready.push_back(w);
    }
    // Nothing to watch and no time to wait: the system call would only cost time.
    if (fds.empty() && timeoutMs == 0) return 0;
    int n = 0;
    if (timeoutMs != 0 && sleepEnter_) {
        sleepEnter_();
        n = ::poll(fds.empty() ? nullptr : fds.data(), fds.size(), timeoutMs);
        const int saved = errno;
        if (sleepLeave_) sleepLeave_();
        errno = saved;
    } else {
        n = ::poll(fds.empty() ? nullptr : fds.data(), fds.size(), timeoutMs);
    }
    if (n < 0) {
        if (errno == EINTR || errno == EAGAIN) return 0;
        throw std::system_error(errno, std::generic_category(), "poll");
    }
    if (n == 0) return 0;
    const uint64_t pass = ++pollPass_;
    int called = 0;
    for (size_t i = 0; i < fds.size(); ++i) {
        if (stopped(stop)) break;
        Watch& w = *ready[i];
        const short revents = fds[i].revents;
        if (revents == 0) continue;
        // Unwatched by an earlier callback, running, or already served by a nested pump
        // whose poll result is newer than ours.
        if (!w.live || w.running || w.lastPass > pass) continue;
        short report;
        if (revents & POLLNVAL) {
            w.invalid = true;
            report = EventLoop::Error;
        } else {
            report =
                static_cast<short>(revents & (w.events | EventLoop::Error | EventLoop::HangUp));
        }
        if (report == 0) continue;
        w.lastPass = pass;
        const std::shared_ptr<Watch> keep = ready[i];  // survives an unwatch inside fn
        RunningScope scope(w.running);
        ++called;
        w.fn(report);
    }
    return called;
}

}  // namespace maroset::platform
