#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/EventLoop.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform {

// A listening TCP socket on the loop, for simulators: every connection a client makes is
// accepted and handed over as a connected TcpStream. Closes its socket when destroyed;
// connections already accepted stay with whoever took them.
class SocketListener {
  public:
    using Accept = std::function<void(std::shared_ptr<TcpStream> connection)>;

    // Listens on address:port (port 0: a free port the system picks). Fails with a VbError
    // carrying the socket control's number (10048 address in use, ...) and a description
    // naming the address.
    SocketListener(EventLoop& loop, const std::string& address, int32_t port, Accept accept);
    ~SocketListener();
    SocketListener(const SocketListener&) = delete;
    SocketListener& operator=(const SocketListener&) = delete;

    // The port it listens on.
    int32_t port() const { return port_; }
    const std::string& address() const { return address_; }

  private:
    void onReady();

    EventLoop& loop_;
    std::string address_;
    int fd_ = -1;
    int32_t port_ = 0;
    Accept accept_;
    std::optional<EventLoop::WatchId> watch_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
