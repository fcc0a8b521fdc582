#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "platform/EventLoop.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform {

// A TCP connection in memory, for tests on the virtual clock: a client end (what the socket
// control holds) and a server end (what a simulator or a test speaks through). It behaves as
// a connection on the loop does:
// - bytes written at one end arrive at the other at a later turn of the loop, one arrival per
//   write, in order; an arrival waits while the previous one's handler is still running;
// - close() at one end is seen as an orderly close at the other, after the bytes before it;
// - reset() breaks both ends with 10054, as a peer that vanishes does.
// It also records every byte each end wrote, so a test can check the bytes on the wire.
//
// TcpNetwork makes links when a client connects to an address a test plugged in; the ends
// may outlive this object.
class MemoryTcpLink {
  public:
    MemoryTcpLink(EventLoop& loop, std::string serverAddress, int32_t serverPort);
    ~MemoryTcpLink();
    MemoryTcpLink(const MemoryTcpLink&) = delete;
    MemoryTcpLink& operator=(const MemoryTcpLink&) = delete;

    std::shared_ptr<TcpStream> clientEnd() const;
    std::shared_ptr<TcpStream> serverEnd() const;

    // Every byte the client end wrote since the last take (or since the start).
    const std::string& clientSent() const;
    std::string takeClientSent();
    // Every byte the server end wrote since the last take.
    const std::string& serverSent() const;
    std::string takeServerSent();

    // Breaks the connection: both ends fail with 10054 at the next turn.
    void reset();
    // True until either end closed or the link was reset.
    bool open() const;

    // Used by TcpNetwork while the client end is connecting.
    void accepted();               // the client end reports connected
    void refused(int32_t number);  // the client end reports the failure

  private:
    struct Line;
    class End;
    std::shared_ptr<Line> line_;
    std::shared_ptr<End> ends_[2];
};

}  // namespace maroset::platform
