// Whatever a coupler answers, the MBT functions return a status: never a crash, a hang or a
// read past the reply. Each input is one call (its first byte picks which) on a fresh loopback
// connection whose peer has already sent the rest of the input and closed its side.
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "platform/mbt/MbtLibrary.h"

namespace {

using maroset::platform::MbtLibrary;

int listener = -1;
uint16_t port = 0;

void listenOnce() {
    listener = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_in addr{};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    if (::bind(listener, reinterpret_cast<sockaddr*>(&addr), sizeof addr) != 0 ||
        ::listen(listener, 4) != 0)
        std::abort();
    socklen_t len = sizeof addr;
    ::getsockname(listener, reinterpret_cast<sockaddr*>(&addr), &len);
    port = ntohs(addr.sin_port);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (listener < 0) listenOnce();
    if (size == 0) return 0;
    MbtLibrary mbt;
    mbt.MBTInit();
    MbtLibrary::Handle handle = 0;
    if (mbt.MBTConnect("127.0.0.1", port, 0, 100, handle) != 0) return 0;
    const int peer = ::accept(listener, nullptr, nullptr);
    if (peer < 0) return 0;
    // The reply is there before the request: a coupler that answers anything at any time.
    if (size > 1) (void)!::send(peer, data + 1, size - 1, MSG_NOSIGNAL);
    ::shutdown(peer, SHUT_WR);

    std::array<uint8_t, 256> buffer{};
    const uint16_t count = static_cast<uint16_t>(1 + (data[0] >> 3) % 16);
    switch (data[0] % 7) {
        case 0: {
            uint8_t status = 0;
            mbt.MBTReadExceptionStatus(handle, status);
            break;
        }
        case 1:
            mbt.MBTReadRegisters(handle, 3, 7, count, buffer);
            break;
        case 2:
            mbt.MBTReadRegisters(handle, 4, 519, count, buffer);
            break;
        case 3:
            mbt.MBTReadCoils(handle, 1, 35, count, buffer);
            break;
        case 4:
            mbt.MBTReadCoils(handle, 0, 8191, count, buffer);
            break;
        case 5:
            mbt.MBTWriteRegisters(handle, 5, count, buffer);
            break;
        default:
            mbt.MBTWriteCoils(handle, 3, count, buffer);
            break;
    }
    // A second call on the same handle: closed after a bad reply, still usable after an
    // exception.
    mbt.MBTReadRegisters(handle, 3, 0, 1, buffer);
    mbt.MBTDisconnect(handle);
    ::close(peer);
    return 0;
}
