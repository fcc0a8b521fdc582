#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/EventLoop.h"
#include "platform/tcp/HostResolver.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform {

// A TCP connection on a non-blocking POSIX socket, served by the loop.
//
// Connect() looks the host name up off the loop (HostResolver; a numeric address needs no
// lookup), then connects without waiting: the loop reports the outcome. An attempt that gets
// no answer gives up after ConnectTimeout with 10060, as the socket control's connect does;
// the system has no time-out of its own for it.
//
// Each readiness of the socket is one recv() of at most ReadChunk bytes, delivered as one
// arrival, so a peer that floods the connection cannot keep the loop from its timers.
// Writes that the socket cannot take at once wait in a buffer and go out as it drains (up to
// MaxWaiting bytes).
// Nagle's algorithm is off: every frame leaves at once.
class SocketStream final : public TcpStream, public std::enable_shared_from_this<SocketStream> {
  public:
    static constexpr std::chrono::milliseconds ConnectTimeout{21000};
    static constexpr size_t ReadChunk = 64 * 1024;
    // Bytes a peer that stops reading may leave waiting before the connection is given up
    // with 10055: a server that floods and never reads cannot make the host grow for ever.
    static constexpr size_t MaxWaiting = 16 * 1024 * 1024;

    static std::shared_ptr<SocketStream> Connect(EventLoop& loop, const std::string& host,
                                                 int32_t port);
    // Takes over a connected descriptor (from accept()).
    static std::shared_ptr<SocketStream> Adopt(EventLoop& loop, int fd);

    explicit SocketStream(EventLoop& loop);
    ~SocketStream() override;
    SocketStream(const SocketStream&) = delete;
    SocketStream& operator=(const SocketStream&) = delete;

    void listen(Handlers handlers) override;
    void write(std::string_view bytes) override;
    void close() override;
    std::string peerAddress() const override { return peerAddress_; }
    int32_t peerPort() const override { return peerPort_; }

  private:
    enum class Phase { Resolving, Connecting, Connected, Done };

    void startConnect(const HostResolver::Address& address);
    void watchFor(short events);
    void onReady(short revents);
    void onConnectReady();
    void readOnce();
    void flush();
    // Ends the connection now and reports the failure at the next turn of the loop.
    void failLater(int32_t number);
    void releaseSocket();
    void notePeer(const sockaddr* address);

    EventLoop& loop_;
    Phase phase_ = Phase::Resolving;
    int fd_ = -1;
    Handlers handlers_;
    std::optional<EventLoop::WatchId> watch_;
    short watching_ = 0;
    std::optional<EventLoop::TimerId> connectTimer_;
    std::unique_ptr<HostResolver::Lookup> lookup_;
    std::string outbox_;
    std::string peerAddress_;
    int32_t peerPort_ = 0;
    // Lets a handler destroy this stream while one of its callbacks is on the stack.
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
