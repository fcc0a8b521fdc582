#include "platform/serial/TerminalDevice.h"

#include <fcntl.h>
#include <sys/file.h>
#include <termios.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "lang/VbError.h"
#include "platform/serial/SerialErrors.h"

namespace maroset::platform {

namespace {

speed_t speedOf(int32_t baud) {
    switch (baud) {
        case 50:
            return B50;
        case 75:
            return B75;
        case 110:
            return B110;
        case 134:
            return B134;
        case 150:
            return B150;
        case 200:
            return B200;
        case 300:
            return B300;
        case 600:
            return B600;
        case 1200:
            return B1200;
        case 1800:
            return B1800;
        case 2400:
            return B2400;
        case 4800:
            return B4800;
        case 9600:
            return B9600;
        case 19200:
            return B19200;
        case 38400:
            return B38400;
        case 57600:
            return B57600;
        case 115200:
            return B115200;
        case 230400:
            return B230400;
        case 460800:
            return B460800;
        case 500000:
            return B500000;
        case 576000:
            return B576000;
        case 921600:
            return B921600;
        case 1000000:
            return B1000000;
        case 1152000:
            return B1152000;
        case 1500000:
            return B1500000;
        case 2000000:
            return B2000000;
        default:
            throw VbError(maroset::err::InvalidPropertyValue);
    }
}

tcflag_t sizeOf(int dataBits) {
    switch (dataBits) {
        case 5:
            return CS5;
        case 6:
            return CS6;
        case 7:
            return CS7;
        default:
            return CS8;
    }
}

[[noreturn]] void cannotOpen(const std::string& path, int error) {
    std::string why = std::strerror(error);
    if (error == EACCES) why += " (is the user in the dialout group?)";
    throw VbError(err::CommInvalidPort, "Cannot open serial device " + path + ": " + why);
}

}  // namespace

std::shared_ptr<TerminalDevice> TerminalDevice::Open(EventLoop& loop, const std::string& path,
                                                     const SerialSettings& settings) {
    const int fd = ::open(path.c_str(), O_RDWR | O_NOCTTY | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0) cannotOpen(path, errno);
    auto device = std::make_shared<TerminalDevice>(loop, fd, path);
    if (::flock(fd, LOCK_EX | LOCK_NB) != 0) {
        if (errno == EWOULDBLOCK)
            throw VbError(err::CommHardwareInUse,
                          "Serial device " + path + " is in use by another program");
        cannotOpen(path, errno);
    }
    MakeRaw(fd, settings, path);
    // A fresh open starts from a quiet line: whatever waited in the buffers is stale.
    ::tcflush(fd, TCIOFLUSH);
    return device;
}

void TerminalDevice::MakeRaw(int fd, const SerialSettings& settings, const std::string& name) {
    termios t{};
    if (::tcgetattr(fd, &t) != 0) cannotOpen(name, errno);
    ::cfmakeraw(&t);
    t.c_iflag &= ~static_cast<tcflag_t>(IXON | IXOFF | IXANY | INPCK | ISTRIP);
    t.c_cflag &= ~static_cast<tcflag_t>(CSIZE | PARENB | PARODD | CMSPAR | CSTOPB | CRTSCTS);
    t.c_cflag |= CLOCAL | CREAD | sizeOf(settings.dataBits);
    switch (settings.parity) {
        case SerialSettings::Parity::None:
            break;
        case SerialSettings::Parity::Even:
            t.c_cflag |= PARENB;
            break;
        case SerialSettings::Parity::Odd:
            t.c_cflag |= PARENB | PARODD;
            break;
        case SerialSettings::Parity::Mark:
            t.c_cflag |= PARENB | CMSPAR | PARODD;
            break;
        case SerialSettings::Parity::Space:
            t.c_cflag |= PARENB | CMSPAR;
            break;
    }
    // Linux has no 1.5 stop bits setting: the UART gives 1.5 for two stop bits at 5 data bits.
    if (settings.stopBits != SerialSettings::StopBits::One) t.c_cflag |= CSTOPB;
    t.c_cc[VMIN] = 0;
    t.c_cc[VTIME] = 0;
    const speed_t speed = speedOf(settings.baud);
    ::cfsetispeed(&t, speed);
    ::cfsetospeed(&t, speed);
    if (::tcsetattr(fd, TCSANOW, &t) != 0) cannotOpen(name, errno);
}

TerminalDevice::TerminalDevice(EventLoop& loop, int fd, std::string name)
    : loop_(loop), fd_(fd), name_(std::move(name)) {}

TerminalDevice::~TerminalDevice() {
    *alive_ = false;
    stopListening();
    if (outputWatch_) loop_.unwatch(*outputWatch_);
    ::close(fd_);
}

void TerminalDevice::listen(Handlers handlers) {
    handlers_ = std::move(handlers);
    if (watch_ || broken_) return;
    watch_ = loop_.watch(fd_, EventLoop::Readable, [this](short revents) { onReady(revents); });
}

void TerminalDevice::stopListening() {
    if (watch_) loop_.unwatch(*watch_);
    watch_.reset();
}

void TerminalDevice::onReady(short) {
    const std::shared_ptr<bool> alive = alive_;
    char buffer[4096];
    for (;;) {
        const ssize_t n = ::read(fd_, buffer, sizeof buffer);
        if (n > 0) {
            // A copy: the handler may destroy this device, and its handlers with it.
            if (const auto received = handlers_.received)
                received(std::string_view(buffer, static_cast<size_t>(n)));
            if (!*alive || !watch_) return;
            if (static_cast<size_t>(n) < sizeof buffer) return;
            continue;
        }
        if (n < 0 && errno == EINTR) continue;
        if (n < 0 && (errno == EAGAIN || errno == EWOULDBLOCK)) return;
        // End of file or an error: the adapter is gone or the other side hung up.
        breakLine(n == 0 ? "end of file" : std::strerror(errno));
        return;
    }
}

void TerminalDevice::breakLine(const std::string& why) {
    if (broken_) return;
    broken_ = true;
    stopListening();
    if (const auto broken = handlers_.broken) broken(why);
}

bool TerminalDevice::write(std::string_view bytes) {
    if (broken_) throw VbError(err::CommDeviceNotOpen, "Serial device " + name_ + " is gone");
    if (output_.empty()) {
        bytes.remove_prefix(writeSome(bytes));
        if (bytes.empty()) return true;
    } else if (output_.size() + bytes.size() > OutputLimit) {
        return false;
    }
    output_.append(bytes);
    if (!outputWatch_) {
        outputWatch_ = loop_.watch(fd_, EventLoop::Writable, [this](short) { drain(); });
    }
    return true;
}

size_t TerminalDevice::writeSome(std::string_view bytes) {
    size_t done = 0;
    while (done < bytes.size()) {
        const ssize_t n = ::write(fd_, bytes.data() + done, bytes.size() - done);
        if (n >= 0) {
            done += static_cast<size_t>(n);
            continue;
        }
        if (errno == EINTR) continue;
        if (errno == EAGAIN || errno == EWOULDBLOCK) break;
        const std::string why = std::strerror(errno);
        throw VbError(err::CommDeviceNotOpen,
                      "Cannot write to serial device " + name_ + ": " + why);
    }
    return done;
}

void TerminalDevice::drain() {
    try {
        output_.erase(0, writeSome(output_));
    } catch (const VbError& e) {
        // Told as the line breaking; the owner's next write fails and reopens the port.
        output_.clear();
        loop_.unwatch(*outputWatch_);
        outputWatch_.reset();
        breakLine(e.description());
        return;
    }
    if (output_.empty()) {
        loop_.unwatch(*outputWatch_);
        outputWatch_.reset();
    }
}

}  // namespace maroset::platform
