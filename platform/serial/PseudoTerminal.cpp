#include "platform/serial/PseudoTerminal.h"

#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "platform/serial/TerminalDevice.h"

namespace maroset::platform {

namespace {

[[noreturn]] void fail(const char* what) {
    throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

PseudoTerminal::PseudoTerminal(EventLoop& loop) {
    const int master = ::posix_openpt(O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
    if (master < 0) fail("posix_openpt");
    auto device = std::make_shared<TerminalDevice>(loop, master, "pseudo-terminal");
    if (::grantpt(master) != 0 || ::unlockpt(master) != 0) fail("unlockpt");
    char name[128];
    if (::ptsname_r(master, name, sizeof name) != 0) fail("ptsname");
    path_ = name;
    terminalFd_ = ::open(name, O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
    if (terminalFd_ < 0) fail("open pseudo-terminal");
    // Raw from the start: a line in cooked mode would echo the simulator's bytes back to it.
    try {
        TerminalDevice::MakeRaw(terminalFd_, SerialSettings{}, path_);
        TerminalDevice::MakeRaw(master, SerialSettings{}, path_);
    } catch (...) {
        ::close(terminalFd_);
        throw;
    }
    master_ = std::move(device);
}

PseudoTerminal::~PseudoTerminal() {
    master_.reset();
    if (terminalFd_ >= 0) ::close(terminalFd_);
}

}  // namespace maroset::platform
