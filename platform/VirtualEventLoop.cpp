#include "platform/VirtualEventLoop.h"

#include <algorithm>

#include "platform/LoopCore.h"

namespace maroset::platform {

struct VirtualEventLoop::Impl {
    Duration now{0};
    LoopCore core;

    // Posted calls, timers due at the current time, then a look at the descriptors. True
    // when a descriptor was served.
    bool turn(const bool* stop) {
        core.runPosted(stop);
        if (stop && *stop) return false;
        core.runDueTimers(now, stop);
        if (stop && *stop) return false;
        return core.pollWatches(0, stop) > 0;
    }
    // Before time moves on, descriptors are looked at again while they are being served: what
    // one party wrote may already wait for another. Bounded, so that a descriptor nobody
    // drains cannot hold virtual time still.
    bool serveAgain(bool served, int& rounds) const {
        if (served && ++rounds < kDescriptorRounds) return true;
        rounds = 0;
        return false;
    }
    static constexpr int kDescriptorRounds = 100;
    // Something still to do without moving time: posted calls or timers due now.
    bool busyNow() const {
        if (core.hasPosted()) return true;
        const auto due = core.nextDue();
        return due && *due <= now;
    }
};

VirtualEventLoop::VirtualEventLoop() : impl_(std::make_unique<Impl>()) {}
VirtualEventLoop::~VirtualEventLoop() = default;

void VirtualEventLoop::advance(Duration d) {
    Impl& m = *impl_;
    LoopCore::Frame frame(m.core);
    const Duration target = m.now + std::max(d, Duration::zero());
    int rounds = 0;
    for (;;) {
        const bool served = m.turn(&frame.stopped);
        if (frame.stopped) return;  // time stays where stop() was called
        if (m.busyNow() || m.serveAgain(served, rounds)) continue;
        const auto due = m.core.nextDue();
        if (!due || *due > target) break;
        // Each timer runs at its own due time; max() keeps time monotonic after a nested
        // advance from inside a callback.
        m.now = std::max(m.now, *due);
    }
    m.now = std::max(m.now, target);
}

size_t VirtualEventLoop::pendingTimers() const {
    return impl_->core.timerCount();
}

EventLoop::Duration VirtualEventLoop::now() const {
    return impl_->now;
}

EventLoop::TimerId VirtualEventLoop::schedule(Duration delay, std::function<void()> fn) {
    return impl_->core.schedule(impl_->now + std::max(delay, Duration::zero()), std::move(fn));
}

void VirtualEventLoop::cancel(TimerId id) {
    impl_->core.cancel(id);
}

void VirtualEventLoop::post(std::function<void()> fn) {
    impl_->core.post(std::move(fn));
}

EventLoop::WatchId VirtualEventLoop::watch(int fd, short events, std::function<void(short)> fn) {
    return impl_->core.watch(fd, events, std::move(fn));
}

void VirtualEventLoop::unwatch(WatchId id) {
    impl_->core.unwatch(id);
}

void VirtualEventLoop::pump() {
    impl_->turn(nullptr);
}

void VirtualEventLoop::run() {
    Impl& m = *impl_;
    LoopCore::Frame frame(m.core);
    int rounds = 0;
    for (;;) {
        const bool served = m.turn(&frame.stopped);
        if (frame.stopped) return;
        if (m.busyNow() || m.serveAgain(served, rounds)) continue;
        const auto due = m.core.nextDue();
        if (!due) return;  // nothing scheduled, nothing posted: a virtual loop would wait forever
        m.now = std::max(m.now, *due);
    }
}

void VirtualEventLoop::runFor(Duration d) {
    advance(d);
}

void VirtualEventLoop::stop() {
    impl_->core.stop();
}

}  // namespace maroset::platform
