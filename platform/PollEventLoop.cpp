#include "platform/PollEventLoop.h"

#include <time.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <optional>

#include "platform/LoopCore.h"

namespace maroset::platform {

namespace {

int64_t monotonicNanos() {
    timespec ts{};
    clock_gettime(CLOCK_MONOTONIC, &ts);
    return static_cast<int64_t>(ts.tv_sec) * 1'000'000'000 + ts.tv_nsec;
}

// Milliseconds to wait until `until`, as poll(2) takes them; never negative.
int waitMs(EventLoop::Duration until, EventLoop::Duration now) {
    const auto ms = (until - now).count();
    return static_cast<int>(std::clamp<int64_t>(ms, 0, INT_MAX));
}

}  // namespace

struct PollEventLoop::Impl {
    int64_t start = monotonicNanos();
    LoopCore core;

    Duration now() const { return Duration((monotonicNanos() - start) / 1'000'000); }

    // One turn of run()/runFor(): posted calls, due timers, then wait for the next due timer,
    // a ready descriptor or the deadline. The wait is the only place the loop sleeps.
    void turn(LoopCore::Frame& frame, std::optional<Duration> deadline) {
        core.runPosted(&frame.stopped);
        if (frame.stopped) return;
        core.runDueTimers(now(), &frame.stopped);
        if (frame.stopped) return;
        int timeout = -1;
        const Duration t = now();
        if (core.hasPosted()) {
            timeout = 0;
        } else {
            if (auto due = core.nextDue()) timeout = waitMs(*due, t);
            if (deadline) {
                const int left = waitMs(*deadline, t);
                timeout = timeout < 0 ? left : std::min(timeout, left);
            }
        }
        core.pollWatches(timeout, &frame.stopped);
    }
};

PollEventLoop::PollEventLoop() : impl_(std::make_unique<Impl>()) {}
PollEventLoop::~PollEventLoop() = default;

EventLoop::Duration PollEventLoop::now() const {
    return impl_->now();
}

EventLoop::TimerId PollEventLoop::schedule(Duration delay, std::function<void()> fn) {
    return impl_->core.schedule(now() + std::max(delay, Duration::zero()), std::move(fn));
}

void PollEventLoop::cancel(TimerId id) {
    impl_->core.cancel(id);
}

void PollEventLoop::post(std::function<void()> fn) {
    impl_->core.post(std::move(fn));
}

EventLoop::WatchId PollEventLoop::watch(int fd, short events, std::function<void(short)> fn) {
    return impl_->core.watch(fd, events, std::move(fn));
}

void PollEventLoop::unwatch(WatchId id) {
    impl_->core.unwatch(id);
}

void PollEventLoop::pump() {
    impl_->core.runPosted(nullptr);
    impl_->core.runDueTimers(now(), nullptr);
    impl_->core.pollWatches(0, nullptr);
}

void PollEventLoop::run() {
    LoopCore::Frame frame(impl_->core);
    while (!frame.stopped) impl_->turn(frame, std::nullopt);
}

void PollEventLoop::runFor(Duration d) {
    LoopCore::Frame frame(impl_->core);
    const Duration deadline = now() + std::max(d, Duration::zero());
    do {
        impl_->turn(frame, deadline);
    } while (!frame.stopped && now() < deadline);
}

void PollEventLoop::stop() {
    impl_->core.stop();
}

}  // namespace maroset::platform
