#include "LoopControl.h"

#include <pybind11/pybind11.h>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <stdexcept>
#include <utility>

#include "core/Runtime.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

using Duration = platform::EventLoop::Duration;

// A run step is this long at most, so a signal that does not wake the loop's poll (one sent
// while callbacks keep it busy) is still seen soon.
constexpr Duration kStep{1000};

PyThreadState* sleeping_ = nullptr;
int runs_ = 0;  // run()/runFor() on the stack
bool stopRequested_ = false;
bool signalled_ = false;

}  // namespace

platform::PollEventLoop& LoopControl::loop() {
    auto* poll = dynamic_cast<platform::PollEventLoop*>(&Runtime::current().loop());
    if (!poll) throw std::logic_error("the runtime's loop is not the real loop");
    return *poll;
}

template <class More>
void LoopControl::runWhile(More&& more) {
    platform::PollEventLoop& l = loop();
    l.setSleepHooks([] { sleeping_ = PyEval_SaveThread(); },
                    [&l] {
                        PyEval_RestoreThread(sleeping_);
                        // A signal interrupts the poll: its handler runs now, and an
                        // exception it raises ends the run.
                        if (PyErr_CheckSignals() != 0) {
                            signalled_ = true;
                            l.stop();
                        }
                    });
    ++runs_;
    struct Leave {
        ~Leave() { --runs_; }
    } leave;
    while (more()) {
        l.runFor(std::min(kStep, more.left()));
        if (std::exchange(signalled_, false) || PyErr_CheckSignals() != 0)
            throw py::error_already_set();
        if (std::exchange(stopRequested_, false)) return;
    }
}

void LoopControl::runFor(double seconds) {
    if (!std::isfinite(seconds) || seconds < 0)
        throw py::value_error("run_for takes a number of seconds, zero or more");
    platform::PollEventLoop& l = loop();
    const Duration deadline =
        l.now() + Duration(static_cast<int64_t>(std::llround(std::min(seconds, 1e9) * 1000)));
    struct Until {
        platform::PollEventLoop& l;
        Duration deadline;
        bool first = true;
        bool operator()() {
            // Zero seconds still runs one turn.
            const bool go = first || l.now() < deadline;
            first = false;
            return go;
        }
        Duration left() const { return std::max(deadline - l.now(), Duration::zero()); }
    } until{l, deadline};
    runWhile(until);
}

void LoopControl::run() {
    struct Forever {
        bool operator()() const { return true; }
        Duration left() const { return kStep; }
    } forever;
    runWhile(forever);
}

void LoopControl::stop() {
    if (runs_ > 0) stopRequested_ = true;
    loop().stop();
}

void LoopControl::pump() {
    loop().pump();
}

int LoopControl::readinessFd() {
    return loop().readinessFd();
}

std::optional<double> LoopControl::prepareWait() {
    const auto wait = loop().prepareExternalWait();
    if (!wait) return std::nullopt;
    return static_cast<double>(wait->count()) / 1000.0;
}

}  // namespace maroset::python
