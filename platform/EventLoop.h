#pragma once

#include <chrono>
#include <cstdint>
#include <functional>

namespace maroset::platform {

// The one loop that drives everything on the host's thread: timers, readiness of file
// descriptors (serial ports, sockets, standard input) and deferred calls.
//
// Promises:
// - now() is monotonic, in milliseconds since the loop was made.
// - A callback runs on the loop's thread from inside pump(), run() or runFor(), never from
//   inside the call that registered it.
// - pump() may be called from inside any callback ("yield to pending events"); it runs what
//   is ready now and returns. A callback is never re-entered while it is still running: a
//   timer or watch whose callback is on the stack is skipped by nested pumps until it
//   returns.
// - A callback may cancel any timer or watch, including its own, and may destroy the object
//   that owns it; a cancelled timer or watch is never called afterwards.
// - Due timers run in due-time order; timers due at the same time in the order they were
//   scheduled. Posted calls run in the order they were posted, before timers of the same turn.
class EventLoop {
  public:
    using Duration = std::chrono::milliseconds;
    using TimerId = uint64_t;
    using WatchId = uint64_t;
    // Readiness flags, as poll(2) spells them.
    enum : short { Readable = 0x001, Writable = 0x004, Error = 0x008, HangUp = 0x010 };

    virtual ~EventLoop() = default;

    virtual Duration now() const = 0;

    // One-shot timer: fn runs once now() has reached now() + delay. Returns an id for cancel().
    virtual TimerId schedule(Duration delay, std::function<void()> fn) = 0;
    virtual void cancel(TimerId id) = 0;

    // Runs fn at the next turn of the loop.
    virtual void post(std::function<void()> fn) = 0;

    // Calls fn(revents) whenever fd is ready for one of events (Readable, Writable); Error
    // and HangUp are always reported. The loop does not own fd.
    virtual WatchId watch(int fd, short events, std::function<void(short revents)> fn) = 0;
    virtual void unwatch(WatchId id) = 0;

    // Runs what is ready now (posted calls, due timers, ready descriptors) and returns.
    virtual void pump() = 0;
    // Runs until stop() is called.
    virtual void run() = 0;
    // Runs for the given time (or until stop()), then returns.
    virtual void runFor(Duration d) = 0;
    // Makes the innermost run() or runFor() return after the current callback.
    virtual void stop() = 0;
};

}  // namespace maroset::platform
