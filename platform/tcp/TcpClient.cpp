#include "platform/tcp/TcpClient.h"

#include <utility>

#include "lang/VbError.h"
#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

TcpClient::TcpClient(TcpNetwork& network) : network_(network) {}

TcpClient::~TcpClient() {
    *alive_ = false;
    drop();
}

void TcpClient::RemotePort(int32_t port) {
    if (port < 0 || port > 65535) throw VbError(sck::InvalidPropertyValue);
    remotePort_ = port;
}

std::string TcpClient::RemoteHostIP() const {
    if (stream_) {
        std::string ip = stream_->peerAddress();
        if (!ip.empty()) return ip;
    }
    return remoteIP_;
}

void TcpClient::Connect() {
    if (state_ != sckClosed) throw VbError(sck::InvalidOp, sck::Description(sck::InvalidOp));
    received_.clear();
    remoteIP_.clear();
    state_ = network_.looksUp(remoteHost_, remotePort_) ? sckResolvingHost : sckConnecting;
    stream_ = network_.connect(remoteHost_, remotePort_);
    // The handlers reach this control only while it lives and still holds that stream.
    const std::weak_ptr<bool> alive = alive_;
    TcpStream* const stream = stream_.get();
    auto mine = [this, alive, stream] { return alive.lock() && stream_.get() == stream; };
    stream_->listen({
        [this, mine] {
            if (mine()) onResolved();
        },
        [this, mine] {
            if (mine()) onConnected();
        },
        [this, mine](std::string_view bytes) {
            if (mine()) onReceived(bytes);
        },
        [this, mine] {
            if (mine()) onClosed();
        },
        [this, mine](int32_t number, const std::string& description) {
            if (mine()) onFailed(number, description);
        },
    });
}

void TcpClient::Close() {
    drop();
    received_.clear();
    state_ = sckClosed;
}

void TcpClient::SendData(std::string_view data) {
    if (state_ != sckConnected) throw VbError(sck::BadState, sck::Description(sck::BadState));
    stream_->write(data);
}

std::string TcpClient::GetData() {
    return std::exchange(received_, {});
}

void TcpClient::onResolved() {
    state_ = sckHostResolved;
    // The connect starts straight after the lookup.
    state_ = sckConnecting;
}

void TcpClient::onConnected() {
    state_ = sckConnected;
    remoteIP_ = stream_->peerAddress();
    Connected.raise();
}

void TcpClient::onReceived(std::string_view bytes) {
    received_.append(bytes);
    DataArrival.raise(static_cast<int32_t>(received_.size()));
}

void TcpClient::onClosed() {
    remoteIP_ = stream_->peerAddress();
    state_ = sckClosing;
    Closed.raise();
}

void TcpClient::onFailed(int32_t number, const std::string& description) {
    remoteIP_ = stream_->peerAddress();
    state_ = sckError;
    Error.raise(static_cast<int16_t>(number), description);
}

void TcpClient::drop() {
    if (!stream_) return;
    std::shared_ptr<TcpStream> stream = std::move(stream_);
    stream->close();
}

}  // namespace maroset::platform
