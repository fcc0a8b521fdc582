#include "platform/tcp/SocketListener.h"

#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>

#include "lang/VbError.h"
#include "platform/tcp/HostResolver.h"
#include "platform/tcp/SocketStream.h"
#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

SocketListener::SocketListener(EventLoop& loop, const std::string& address, int32_t port,
                               Accept accept)
    : loop_(loop), address_(address), accept_(std::move(accept)) {
    auto fail = [&](int error) {
        const int32_t number = sck::FromErrno(error);
        if (fd_ >= 0) ::close(fd_);
        fd_ = -1;
        throw VbError(number,
                      sck::Description(number) + " (" + address + ":" + std::to_string(port) + ")");
    };
    if (port < 0 || port > 65535) throw VbError(sck::InvalidPropertyValue);
    HostResolver::Address where;
    if (!HostResolver::Numeric(address, port, where)) fail(EADDRNOTAVAIL);
    fd_ = ::socket(where.storage.ss_family, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    if (fd_ < 0) fail(errno);
    const int on = 1;
    ::setsockopt(fd_, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    if (::bind(fd_, reinterpret_cast<const sockaddr*>(&where.storage), where.length) != 0)
        fail(errno);
    if (::listen(fd_, SOMAXCONN) != 0) fail(errno);
    sockaddr_storage bound{};
    socklen_t length = sizeof bound;
    ::getsockname(fd_, reinterpret_cast<sockaddr*>(&bound), &length);
    port_ = bound.ss_family == AF_INET6 ? ntohs(reinterpret_cast<sockaddr_in6*>(&bound)->sin6_port)
                                        : ntohs(reinterpret_cast<sockaddr_in*>(&bound)->sin_port);
    watch_ = loop_.watch(fd_, EventLoop::Readable, [this](short) { onReady(); });
}

SocketListener::~SocketListener() {
    *alive_ = false;
    if (watch_) loop_.unwatch(*watch_);
    if (fd_ >= 0) ::close(fd_);
}

void SocketListener::onReady() {
    const std::shared_ptr<bool> alive = alive_;
    // A few at a time, so a storm of connects cannot hold the loop.
    for (int i = 0; i < 16 && *alive; ++i) {
        const int fd = ::accept4(fd_, nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC);
        if (fd < 0) return;  // EAGAIN, or a connection that went away before we took it
        auto stream = SocketStream::Adopt(loop_, fd);
        // A copy: the handler may destroy this listener.
        if (const Accept accept = accept_) accept(std::move(stream));
    }
}

}  // namespace maroset::platform
