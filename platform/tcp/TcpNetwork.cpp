#include "platform/tcp/TcpNetwork.h"

#include "lang/Strings.h"
#include "platform/tcp/HostResolver.h"
#include "platform/tcp/SocketStream.h"
#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

TcpNetwork::Key TcpNetwork::keyOf(const std::string& host, int32_t port) {
    return {LCase(host), port};
}

void TcpNetwork::plug(const std::string& host, int32_t port, Accept accept,
                      std::chrono::milliseconds connectDelay, std::string address) {
    servers_[keyOf(host, port)] = Server{std::move(accept), connectDelay, std::move(address)};
}

void TcpNetwork::unplug(const std::string& host, int32_t port) {
    servers_.erase(keyOf(host, port));
}

bool TcpNetwork::looksUp(const std::string& host, int32_t port) const {
    return realSockets_ && !servers_.count(keyOf(host, port)) && !HostResolver::IsNumeric(host);
}

std::shared_ptr<TcpStream> TcpNetwork::connect(const std::string& host, int32_t port) {
    const Key key = keyOf(host, port);
    const auto it = servers_.find(key);
    if (it == servers_.end() && realSockets_) return SocketStream::Connect(loop_, host, port);

    const std::string address = it != servers_.end() ? it->second.address : host;
    const auto delay = it != servers_.end() ? it->second.delay : std::chrono::milliseconds(0);
    auto link = std::make_shared<MemoryTcpLink>(loop_, address, port);
    lastLink_ = link;
    // The server is looked up again when the connection comes up: one unplugged meanwhile
    // refuses it.
    loop_.schedule(delay, [this, key, link] {
        const auto server = servers_.find(key);
        if (server == servers_.end() || !server->second.accept) {
            link->refused(sck::ConnectionRefused);
            return;
        }
        link->accepted();
        const Accept accept = server->second.accept;  // may unplug itself
        accept(link);
    });
    return link->clientEnd();
}

}  // namespace maroset::platform
