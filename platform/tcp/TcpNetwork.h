#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>

#include "platform/EventLoop.h"
#include "platform/tcp/MemoryTcpLink.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform {

// Where socket controls make their connections: to a server a test or simulator plugged in
// here under host and port (in memory, on the loop's clock), otherwise to a real socket.
//
// Unit tests turn real sockets off, so an address nobody plugged is refused (10061) the way
// a host with no server answers, without touching the network.
class TcpNetwork {
  public:
    // Called with each new link once its connection is made; keep link->serverEnd().
    using Accept = std::function<void(const std::shared_ptr<MemoryTcpLink>& link)>;

    explicit TcpNetwork(EventLoop& loop) : loop_(loop) {}

    // From now on, connections to host:port (host in any letter case) are made in memory and
    // handed to accept; each takes connectDelay to come up. A plugged address is reported as
    // `address` to the client.
    void plug(const std::string& host, int32_t port, Accept accept,
              std::chrono::milliseconds connectDelay = std::chrono::milliseconds(0),
              std::string address = "127.0.0.1");
    // Later connections to host:port are refused (or go to real sockets, when they are on).
    void unplug(const std::string& host, int32_t port);

    void setRealSockets(bool on) { realSockets_ = on; }
    bool realSockets() const { return realSockets_; }

    // Starts a connection to host:port; the stream reports the outcome through its handlers.
    std::shared_ptr<TcpStream> connect(const std::string& host, int32_t port);
    // Whether connect(host, port) begins with a name lookup (a real connection to a name).
    bool looksUp(const std::string& host, int32_t port) const;

    // The last in-memory link made, for tests that play the server themselves.
    std::shared_ptr<MemoryTcpLink> lastLink() const { return lastLink_.lock(); }

  private:
    struct Server {
        Accept accept;
        std::chrono::milliseconds delay;
        std::string address;
    };
    using Key = std::pair<std::string, int32_t>;
    static Key keyOf(const std::string& host, int32_t port);

    EventLoop& loop_;
    std::map<Key, Server> servers_;
    bool realSockets_ = true;
    std::weak_ptr<MemoryTcpLink> lastLink_;
};

}  // namespace maroset::platform
