#include "platform/tcp/SocketStream.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>

#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

namespace {

void noDelay(int fd) {
    const int on = 1;
    ::setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
}

}  // namespace

SocketStream::SocketStream(EventLoop& loop) : loop_(loop) {}

SocketStream::~SocketStream() {
    *alive_ = false;
    releaseSocket();
}

std::shared_ptr<SocketStream> SocketStream::Connect(EventLoop& loop, const std::string& host,
                                                    int32_t port) {
    auto stream = std::make_shared<SocketStream>(loop);
    HostResolver::Address address;
    if (HostResolver::Numeric(host, port, address)) {
        stream->startConnect(address);
        return stream;
    }
    std::weak_ptr<SocketStream> weak = stream;
    stream->lookup_ = HostResolver::Resolve(
        loop, host, port, [weak](int32_t error, const HostResolver::Address& found) {
            const auto self = weak.lock();
            if (!self || self->phase_ != Phase::Resolving) return;
            self->lookup_.reset();  // not inside its own callback's object: it is done with us
            if (error != 0) {
                self->phase_ = Phase::Done;
                if (const auto failed = self->handlers_.failed)
                    failed(error, sck::Description(error));
                return;
            }
            const std::shared_ptr<bool> alive = self->alive_;
            if (const auto resolved = self->handlers_.resolved) resolved();
            if (!*alive || self->phase_ != Phase::Resolving) return;
            self->startConnect(found);
        });
    return stream;
}

std::shared_ptr<SocketStream> SocketStream::Adopt(EventLoop& loop, int fd) {
    auto stream = std::make_shared<SocketStream>(loop);
    stream->fd_ = fd;
    stream->phase_ = Phase::Connected;
    noDelay(fd);
    sockaddr_storage peer{};
    socklen_t length = sizeof peer;
    if (::getpeername(fd, reinterpret_cast<sockaddr*>(&peer), &length) == 0)
        stream->notePeer(reinterpret_cast<sockaddr*>(&peer));
    stream->watchFor(EventLoop::Readable);
    return stream;
}

void SocketStream::listen(Handlers handlers) {
    handlers_ = std::move(handlers);
}

void SocketStream::startConnect(const HostResolver::Address& address) {
    phase_ = Phase::Connecting;
    notePeer(reinterpret_cast<const sockaddr*>(&address.storage));
    const int port = peerPort_;
    if (port == 0) {
        failLater(sck::AddressNotAvailable);  // nothing listens at port 0
        return;
    }
    fd_ = ::socket(address.storage.ss_family, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    if (fd_ < 0) {
        failLater(sck::FromErrno(errno));
        return;
    }
    noDelay(fd_);
    if (::connect(fd_, reinterpret_cast<const sockaddr*>(&address.storage), address.length) == 0) {
        // Connected at once (loopback may do this): reported at the next turn all the same.
        watchFor(EventLoop::Writable);
        return;
    }
    if (errno != EINPROGRESS) {
        failLater(sck::FromErrno(errno));
        return;
    }
    watchFor(EventLoop::Writable);
    std::weak_ptr<bool> alive = alive_;
    connectTimer_ = loop_.schedule(ConnectTimeout, [this, alive] {
        if (!alive.lock()) return;
        connectTimer_.reset();
        if (phase_ == Phase::Connecting) failLater(sck::Timedout);
    });
}

void SocketStream::watchFor(short events) {
    if (watch_ && watching_ == events) return;
    if (watch_) loop_.unwatch(*watch_);
    watching_ = events;
    watch_ = loop_.watch(fd_, events, [this](short revents) { onReady(revents); });
}

void SocketStream::onReady(short revents) {
    switch (phase_) {
        case Phase::Connecting:
            onConnectReady();
            return;
        case Phase::Connected:
            break;
        default:
            return;
    }
    const std::shared_ptr<bool> alive = alive_;
    if (revents & EventLoop::Writable) {
        flush();
        if (!*alive || phase_ != Phase::Connected) return;
    }
    if (revents & (EventLoop::Readable | EventLoop::HangUp | EventLoop::Error)) readOnce();
}

void SocketStream::onConnectReady() {
    int error = 0;
    socklen_t length = sizeof error;
    if (::getsockopt(fd_, SOL_SOCKET, SO_ERROR, &error, &length) != 0) error = errno;
    if (error != 0) {
        failLater(sck::FromErrno(error));
        return;
    }
    if (connectTimer_) loop_.cancel(*connectTimer_);
    connectTimer_.reset();
    phase_ = Phase::Connected;
    sockaddr_storage peer{};
    socklen_t peerLength = sizeof peer;
    if (::getpeername(fd_, reinterpret_cast<sockaddr*>(&peer), &peerLength) == 0)
        notePeer(reinterpret_cast<sockaddr*>(&peer));
    watchFor(outbox_.empty() ? EventLoop::Readable : EventLoop::Readable | EventLoop::Writable);
    if (const auto connected = handlers_.connected) connected();
}

void SocketStream::readOnce() {
    char buffer[ReadChunk];
    const ssize_t n = ::recv(fd_, buffer, sizeof buffer, 0);
    if (n > 0) {
        if (const auto received = handlers_.received)
            received(std::string_view(buffer, static_cast<size_t>(n)));
        return;
    }
    if (n == 0) {
        phase_ = Phase::Done;
        releaseSocket();
        if (const auto closed = handlers_.closed) closed();
        return;
    }
    if (errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR) return;
    const int32_t number = sck::FromErrno(errno);
    phase_ = Phase::Done;
    releaseSocket();
    if (const auto failed = handlers_.failed) failed(number, sck::Description(number));
}

void SocketStream::write(std::string_view bytes) {
    if (phase_ == Phase::Done || bytes.empty()) return;
    if (outbox_.size() + bytes.size() > MaxWaiting) {
        failLater(sck::NoBufferSpace);
        return;
    }
    outbox_.append(bytes);
    if (phase_ == Phase::Connected) flush();
}

void SocketStream::flush() {
    size_t sent = 0;
    while (sent < outbox_.size()) {
        const ssize_t n =
            ::send(fd_, outbox_.data() + sent, outbox_.size() - sent, MSG_NOSIGNAL | MSG_DONTWAIT);
        if (n > 0) {
            sent += static_cast<size_t>(n);
            continue;
        }
        if (n < 0 && errno == EINTR) continue;
        if (n < 0 && (errno == EAGAIN || errno == EWOULDBLOCK)) break;
        failLater(sck::FromErrno(n < 0 ? errno : ECONNRESET));
        return;
    }
    outbox_.erase(0, sent);
    watchFor(outbox_.empty() ? EventLoop::Readable : EventLoop::Readable | EventLoop::Writable);
}

void SocketStream::failLater(int32_t number) {
    phase_ = Phase::Done;
    releaseSocket();
    loop_.post([this, alive = std::weak_ptr<bool>(alive_), number] {
        if (!alive.lock()) return;
        if (const auto failed = handlers_.failed) failed(number, sck::Description(number));
    });
}

void SocketStream::close() {
    phase_ = Phase::Done;
    handlers_ = {};
    lookup_.reset();
    releaseSocket();
}

void SocketStream::releaseSocket() {
    if (connectTimer_) loop_.cancel(*connectTimer_);
    connectTimer_.reset();
    if (watch_) loop_.unwatch(*watch_);
    watch_.reset();
    watching_ = 0;
    if (fd_ >= 0) ::close(fd_);
    fd_ = -1;
    outbox_.clear();
}

void SocketStream::notePeer(const sockaddr* address) {
    char text[INET6_ADDRSTRLEN] = "";
    if (address->sa_family == AF_INET) {
        const auto* v4 = reinterpret_cast<const sockaddr_in*>(address);
        ::inet_ntop(AF_INET, &v4->sin_addr, text, sizeof text);
        peerPort_ = ntohs(v4->sin_port);
    } else if (address->sa_family == AF_INET6) {
        const auto* v6 = reinterpret_cast<const sockaddr_in6*>(address);
        ::inet_ntop(AF_INET6, &v6->sin6_addr, text, sizeof text);
        peerPort_ = ntohs(v6->sin6_port);
    }
    peerAddress_ = text;
}

}  // namespace maroset::platform
