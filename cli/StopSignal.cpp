#include "cli/StopSignal.h"

#include <signal.h>
#include <sys/signalfd.h>
#include <unistd.h>

namespace maroset::cli {

namespace {

sigset_t stopSignals() {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGTERM);
    return set;
}

}  // namespace

StopSignal::StopSignal(platform::EventLoop& loop, std::function<void()> onStop)
    : loop_(loop), onStop_(std::move(onStop)) {
    const sigset_t set = stopSignals();
    sigprocmask(SIG_BLOCK, &set, nullptr);
    fd_ = signalfd(-1, &set, SFD_NONBLOCK | SFD_CLOEXEC);
    if (fd_ < 0) {
        // Without a signalfd the signals keep their usual effect.
        sigprocmask(SIG_UNBLOCK, &set, nullptr);
        return;
    }
    watch_ = loop_.watch(fd_, platform::EventLoop::Readable, [this](short) {
        signalfd_siginfo info;
        bool any = false;
        while (::read(fd_, &info, sizeof info) == static_cast<ssize_t>(sizeof info)) any = true;
        if (!any) return;
        received_ = true;
        if (onStop_) onStop_();
    });
}

StopSignal::~StopSignal() {
    if (fd_ < 0) return;
    if (watch_) loop_.unwatch(*watch_);
    // A signal that came after the last look was taken care of by stopping anyway: drop it
    // rather than let it kill the process on the way out.
    signalfd_siginfo info;
    while (::read(fd_, &info, sizeof info) == static_cast<ssize_t>(sizeof info)) {
    }
    ::close(fd_);
    const sigset_t set = stopSignals();
    sigprocmask(SIG_UNBLOCK, &set, nullptr);
}

}  // namespace maroset::cli
