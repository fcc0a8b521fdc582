#pragma once

#include <sys/socket.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/EventLoop.h"

namespace maroset::platform {

// Looks host names up without blocking the loop: getaddrinfo() runs on a short-lived helper
// thread, and the answer comes back to the loop through an eventfd the loop watches. The
// loop's thread never waits for a name server, however slow it is. A numeric address needs no
// lookup (see IsNumeric) and never starts a thread.
//
// Dropping the Lookup handle cancels the callback; the helper thread then finishes on its own
// and frees what it used.
class HostResolver {
  public:
    struct Address {
        sockaddr_storage storage{};
        socklen_t length = 0;
    };
    // error is 0 or the socket control's number (11001 host not found, ...).
    using Done = std::function<void(int32_t error, const Address& address)>;

    class Lookup {
      public:
        virtual ~Lookup() = default;
    };

    // Starts looking up host (first address of any family) for TCP port `port`.
    static std::unique_ptr<Lookup> Resolve(EventLoop& loop, const std::string& host, int32_t port,
                                           Done done);

    // The address when host is a numeric IPv4 or IPv6 address.
    static bool Numeric(const std::string& host, int32_t port, Address& out);
    static bool IsNumeric(const std::string& host);
};

}  // namespace maroset::platform
