#pragma once

#include <string>
#include <string_view>

namespace maroset::sim {

// What every device simulator offers besides its own typed API (which tests use): where a
// host reaches it, and the operator's commands that change its data or inject faults, as
// `maroset sim` reads them from standard input while it serves.
//
// A simulator runs on the runtime's loop, like the system itself: in-process on the virtual
// clock in unit tests, on a pseudo-terminal or loopback TCP for integration tests, the demo
// and `maroset sim`.
class Simulator {
  public:
    virtual ~Simulator() = default;

    // Where a host reaches it: a pseudo-terminal path ("/dev/pts/5") or "127.0.0.1:15020".
    virtual std::string endpoint() const = 0;
    // The commands it takes, one per line, each with what it does.
    virtual std::string help() const = 0;
    // Carries out one command line and returns the answer to show the operator. A line it
    // does not understand is answered with what is wrong, never an exception.
    virtual std::string command(std::string_view line) = 0;
};

}  // namespace maroset::sim
