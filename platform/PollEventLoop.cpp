#include "platform/PollEventLoop.h"

#include <sys/epoll.h>
#include <sys/eventfd.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <optional>
#include <system_error>
#include <utility>
#include <vector>

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
    // How many run(), runFor() or pump() calls are on the stack: work queued outside them
    // wakes an external waiter.
    int dispatching = 0;
    // The external wait, made on first use: an epoll instance mirroring the watches, with
    // an eventfd in it for work queued from outside.
    int epollFd = -1;
    int wakeFd = -1;
    uint64_t mirroredGeneration = 0;
    std::vector<int> mirrored;

    ~Impl() {
        if (epollFd >= 0) ::close(epollFd);
        if (wakeFd >= 0) ::close(wakeFd);
    }

    struct Dispatch {
        explicit Dispatch(Impl& impl) : depth(impl.dispatching) { ++depth; }
        ~Dispatch() { --depth; }
        Dispatch(const Dispatch&) = delete;
        Dispatch& operator=(const Dispatch&) = delete;
        int& depth;
    };

    void wakeExternalWaiter() const {
        if (wakeFd < 0 || dispatching > 0) return;
        const uint64_t one = 1;
        [[maybe_unused]] const auto n = ::write(wakeFd, &one, sizeof one);
    }

    void mirrorWatches() {
        const uint64_t generation = core.watchGeneration();
        if (generation == mirroredGeneration) return;
        for (int fd : mirrored) ::epoll_ctl(epollFd, EPOLL_CTL_DEL, fd, nullptr);
        mirrored.clear();
        // One registration per descriptor, with the events of all its watches; the poll
        // flags and the epoll flags share their values.
        std::vector<std::pair<int, short>> set = core.pollSet();
        std::sort(set.begin(), set.end());
        for (size_t i = 0; i < set.size();) {
            epoll_event ev{};
            ev.data.fd = set[i].first;
            for (; i < set.size() && set[i].first == ev.data.fd; ++i)
                ev.events |= static_cast<uint32_t>(set[i].second);
            if (::epoll_ctl(epollFd, EPOLL_CTL_ADD, ev.data.fd, &ev) == 0)
                mirrored.push_back(ev.data.fd);
        }
        mirroredGeneration = generation;
    }

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
    const TimerId id =
        impl_->core.schedule(now() + std::max(delay, Duration::zero()), std::move(fn));
    impl_->wakeExternalWaiter();
    return id;
}

void PollEventLoop::cancel(TimerId id) {
    impl_->core.cancel(id);
}

void PollEventLoop::post(std::function<void()> fn) {
    impl_->core.post(std::move(fn));
    impl_->wakeExternalWaiter();
}

EventLoop::WatchId PollEventLoop::watch(int fd, short events, std::function<void(short)> fn) {
    return impl_->core.watch(fd, events, std::move(fn));
}

void PollEventLoop::unwatch(WatchId id) {
    impl_->core.unwatch(id);
}

void PollEventLoop::pump() {
    Impl::Dispatch dispatch(*impl_);
    impl_->core.runPosted(nullptr);
    impl_->core.runDueTimers(now(), nullptr);
    impl_->core.pollWatches(0, nullptr);
}

void PollEventLoop::run() {
    Impl::Dispatch dispatch(*impl_);
    LoopCore::Frame frame(impl_->core);
    while (!frame.stopped) impl_->turn(frame, std::nullopt);
}

void PollEventLoop::runFor(Duration d) {
    Impl::Dispatch dispatch(*impl_);
    LoopCore::Frame frame(impl_->core);
    const Duration deadline = now() + std::max(d, Duration::zero());
    do {
        impl_->turn(frame, deadline);
    } while (!frame.stopped && now() < deadline);
}

void PollEventLoop::stop() {
    impl_->core.stop();
}

int PollEventLoop::readinessFd() {
    Impl& d = *impl_;
    if (d.epollFd >= 0) return d.epollFd;
    d.epollFd = ::epoll_create1(EPOLL_CLOEXEC);
    if (d.epollFd < 0) throw std::system_error(errno, std::generic_category(), "epoll_create1");
    d.wakeFd = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (d.wakeFd < 0) throw std::system_error(errno, std::generic_category(), "eventfd");
    epoll_event ev{};
    ev.events = EPOLLIN;
    ev.data.fd = d.wakeFd;
    ::epoll_ctl(d.epollFd, EPOLL_CTL_ADD, d.wakeFd, &ev);
    d.mirroredGeneration = d.core.watchGeneration() - 1;  // mirror on the first prepare
    return d.epollFd;
}

std::optional<EventLoop::Duration> PollEventLoop::prepareExternalWait() {
    Impl& d = *impl_;
    readinessFd();
    uint64_t count = 0;
    [[maybe_unused]] const auto n = ::read(d.wakeFd, &count, sizeof count);  // drains it
    d.mirrorWatches();
    if (d.core.hasPosted()) return Duration::zero();
    const auto due = d.core.nextDue();
    if (!due) return std::nullopt;
    return std::max(*due - now(), Duration::zero());
}

void PollEventLoop::setSleepHooks(std::function<void()> enter, std::function<void()> leave) {
    impl_->core.setSleepHooks(std::move(enter), std::move(leave));
}

}  // namespace maroset::platform
