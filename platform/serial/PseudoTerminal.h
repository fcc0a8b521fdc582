#pragma once

#include <memory>
#include <string>

#include "platform/EventLoop.h"
#include "platform/serial/SerialDevice.h"

namespace maroset::platform {

// A pseudo-terminal pair standing in for a serial cable: the system opens the terminal at
// path() as it would open /dev/ttyUSB0, and a simulator speaks through deviceEnd(). The
// terminal side is kept open here, in raw mode, so that it neither echoes nor hangs up while
// the system has it closed. Fails with std::system_error when no pair can be made.
class PseudoTerminal {
  public:
    explicit PseudoTerminal(EventLoop& loop);
    ~PseudoTerminal();
    PseudoTerminal(const PseudoTerminal&) = delete;
    PseudoTerminal& operator=(const PseudoTerminal&) = delete;

    // The terminal's device path ("/dev/pts/5").
    const std::string& path() const { return path_; }
    // The other side of the line.
    std::shared_ptr<SerialDevice> deviceEnd() const { return master_; }

  private:
    std::string path_;
    int terminalFd_ = -1;
    std::shared_ptr<SerialDevice> master_;
};

}  // namespace maroset::platform
