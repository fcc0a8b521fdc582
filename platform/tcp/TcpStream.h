#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

namespace maroset::platform {

// One TCP connection as a byte stream: a real socket (SocketStream) or one end of an
// in-memory link (MemoryTcpLink). What the socket control drives and what a simulator serves
// through.
//
// - Handlers run on the runtime's loop, never inside a call into the stream (write, close,
//   listen). A handler may close the stream, stop listening or destroy the stream.
// - A stream made by connecting starts out connecting: `resolved` (only when a host name had
//   to be looked up), then `connected` or `failed`. An accepted stream is connected at once.
// - received() gets the bytes in order, one call per arrival; a new arrival is never
//   delivered while the previous one's handler is still running (it waits for it to return).
// - write() queues the bytes and returns; a failure to send shows later as `failed`.
// - After `closed` (the peer ended the connection) or `failed`, nothing more is delivered.
class TcpStream {
  public:
    struct Handlers {
        std::function<void()> resolved;
        std::function<void()> connected;
        std::function<void(std::string_view bytes)> received;
        // The peer closed its side in order.
        std::function<void()> closed;
        // The connection could not be made or broke, with the socket control's error number
        // and text (10061 connection refused, 10054 reset by the peer, 11001 host not found).
        std::function<void(int32_t number, const std::string& description)> failed;
    };

    virtual ~TcpStream() = default;

    // Starts delivering to handlers, replacing earlier ones.
    virtual void listen(Handlers handlers) = 0;
    // Queues bytes for the peer. Ignored once the stream is closed or failed.
    virtual void write(std::string_view bytes) = 0;
    // Ends the connection; nothing is delivered afterwards. Safe to call more than once.
    virtual void close() = 0;
    // The peer's address ("127.0.0.1") once known, "" before.
    virtual std::string peerAddress() const = 0;
    // The peer's port, 0 before it is known.
    virtual int32_t peerPort() const = 0;
};

}  // namespace maroset::platform
