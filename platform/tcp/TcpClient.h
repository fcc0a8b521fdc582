#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "lang/Event.h"
#include "platform/tcp/TcpNetwork.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform {

// The TCP client socket control the system's connection owners hold: a remote host and port,
// an asynchronous Connect, a State, SendData, GetData and Close, and the events Connected,
// DataArrival, Closed and Error.
//
// States, with the control's numbers:
//   0 closed, 1 open, 2 listening, 3 connection pending, 4 resolving host, 5 host resolved,
//   6 connecting, 7 connected, 8 the peer is closing, 9 error.
// Connect goes 4 -> 5 -> 6 -> 7 for a host name (looked up off the loop, see HostResolver)
// and straight to 6 -> 7 for a numeric address. A failed connect or a broken connection
// raises Error (10061 refused, 10060 timed out, 10054 reset, 11001 host not found, ...) and
// leaves state 9; a peer that closes in order raises Closed and leaves state 8. Only Close
// brings the control back to 0, ready for the next Connect.
//
// - Connect in any state but 0 fails with 40020; SendData in any state but 7 with 40006;
//   a RemotePort outside 0..65535 with 380. These fail the call; nothing else does.
// - DataArrival(bytesTotal) is raised for each arrival with the number of bytes waiting;
//   GetData takes all of them. Bytes nobody takes add up.
// - Events are raised on the loop, never inside a call into the control. A handler may
//   close the control or destroy it.
class TcpClient {
  public:
    enum : int16_t {
        sckClosed = 0,
        sckOpen = 1,
        sckListening = 2,
        sckConnectionPending = 3,
        sckResolvingHost = 4,
        sckHostResolved = 5,
        sckConnecting = 6,
        sckConnected = 7,
        sckClosing = 8,
        sckError = 9,
    };

    explicit TcpClient(TcpNetwork& network);
    ~TcpClient();
    TcpClient(const TcpClient&) = delete;
    TcpClient& operator=(const TcpClient&) = delete;

    const std::string& RemoteHost() const { return remoteHost_; }
    void RemoteHost(const std::string& host) { remoteHost_ = host; }
    int32_t RemotePort() const { return remotePort_; }
    void RemotePort(int32_t port);
    // The peer's address once connecting has begun ("" before).
    std::string RemoteHostIP() const;
    int16_t State() const { return state_; }
    // Bytes waiting for GetData.
    int32_t BytesReceived() const { return static_cast<int32_t>(received_.size()); }

    void Connect();
    void Close();
    void SendData(std::string_view data);
    std::string GetData();

    Event<> Connected;
    Event<int32_t> DataArrival;
    Event<> Closed;
    Event<int16_t, const std::string&> Error;

  private:
    void onResolved();
    void onConnected();
    void onReceived(std::string_view bytes);
    void onClosed();
    void onFailed(int32_t number, const std::string& description);
    void drop();

    TcpNetwork& network_;
    std::string remoteHost_;
    int32_t remotePort_ = 0;
    int16_t state_ = sckClosed;
    std::shared_ptr<TcpStream> stream_;
    std::string remoteIP_;
    std::string received_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
