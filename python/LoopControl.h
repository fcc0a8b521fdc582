#pragma once

#include <optional>

#include "platform/PollEventLoop.h"

namespace maroset::python {

// The runtime's loop as Python drives it: run_for, run and stop on the calling thread, or
// pump from another loop (asyncio) that waits on the readiness descriptor. Callbacks run
// with the interpreter lock held; the lock is given up only while the loop sleeps, so other
// Python threads run meanwhile. Signals (Ctrl-C) end a run with their exception.
class LoopControl {
  public:
    // Runs the loop for `seconds` (or until stop()).
    static void runFor(double seconds);
    // Runs the loop until stop().
    static void run();
    // Makes the innermost runFor() or run() return once the current callback is done.
    static void stop();
    // Runs what is ready now and returns.
    static void pump();
    static int readinessFd();
    // Seconds the host may wait before the next pump(); nothing: until the descriptor is ready.
    static std::optional<double> prepareWait();

  private:
    static platform::PollEventLoop& loop();
    // Runs the loop in steps until `more` says no, a stop() or a signal ends it.
    template <class More>
    static void runWhile(More&& more);
};

}  // namespace maroset::python
