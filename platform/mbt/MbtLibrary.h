#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <span>
#include <string>

#include "platform/mbt/MbtStatus.h"

namespace maroset::platform {

// The "MBT" Modbus/TCP client library the coupler driver calls, on libmodbus. Every function
// returns a status (MbtStatus.h): 0 for success, the coupler's Modbus exception code, or one
// of the library's own failures.
//
// - Calls are synchronous and block the calling thread: a connect for at most the request
//   time-out given to MBTConnect, a request for at most that time-out until its whole reply is
//   in. A completion callback is not offered (NotSupported); pass none.
// - Table types: 3 input registers (function 04), 4 holding registers (03), 1 discrete inputs
//   (02), 0 coils (01). Writes use functions 16 and 15. MBTReadExceptionStatus is function 07.
// - Buffers hold the data as it travels on the wire: registers high byte first, bits packed
//   eight to a byte, the lowest address in bit 0 of the first byte. So a register read into a
//   16-bit integer of this machine comes out with its bytes exchanged; MBTSwapWord puts them
//   right.
// - A request that times out or gets a reply that does not answer it closes its connection:
//   a late reply can never be taken for the answer to a later request. Further calls on that
//   handle fail with ConnectionClosed until it is disconnected. A Modbus exception reply
//   leaves the connection usable.
// - Handles are this library object's own; the destructor closes the connections still open.
//   One object belongs to one thread.
class MbtLibrary {
  public:
    using Handle = int32_t;
    // Completion callbacks of asynchronous requests (not offered: pass nullptr).
    using MBTReadCompleted = void (*)(Handle hSocket, uint32_t callbackContext, int32_t result,
                                      uint8_t tableType, uint16_t dataStartAddress,
                                      uint16_t numRead, uint16_t numBytes,
                                      const uint8_t* readBuffer);
    using MBTWriteCompleted = void (*)(Handle hSocket, uint32_t callbackContext, int32_t result,
                                       uint8_t tableType, uint16_t dataStartAddress,
                                       uint16_t numWrite, const uint8_t* writeBuffer);
    // Where a connection to a port really goes: the host can send the coupler's fixed port
    // 502 elsewhere, so that simulators and tests run without privileges.
    using PortMap = std::function<uint16_t(uint16_t port)>;

    explicit MbtLibrary(PortMap portMap = {});
    ~MbtLibrary();
    MbtLibrary(const MbtLibrary&) = delete;
    MbtLibrary& operator=(const MbtLibrary&) = delete;

    // Counted: MBTConnect needs at least one MBTInit not yet matched by MBTExit. Neither
    // touches open connections.
    int32_t MBTInit();
    int32_t MBTExit();

    // Connects to hostAddress (an IPv4 address such as "192.168.1.10") at port (mapped by the
    // port map). protocol 0 is TCP, the only one offered. requestTimeout (ms, above 0) bounds
    // the connect and every later request on the connection. hSocket receives the new handle,
    // or 0 when the call fails.
    int32_t MBTConnect(const std::string& hostAddress, uint16_t port, int32_t protocol,
                       uint32_t requestTimeout, Handle& hSocket);
    int32_t MBTDisconnect(Handle hSocket);

    // Reads the coupler's eight exception status outputs (function 07).
    int32_t MBTReadExceptionStatus(Handle hSocket, uint8_t& exceptionStatus,
                                   MBTReadCompleted callback = nullptr,
                                   uint32_t callbackContext = 0);
    // numWords 1 to 125; readBuffer at least 2 bytes a word.
    int32_t MBTReadRegisters(Handle hSocket, uint8_t tableType, uint16_t dataStartAddress,
                             uint16_t numWords, std::span<uint8_t> readBuffer,
                             MBTReadCompleted callback = nullptr, uint32_t callbackContext = 0);
    // numBits 1 to 2000; readBuffer at least one byte per eight bits. Bits past numBits in the
    // last byte are 0.
    int32_t MBTReadCoils(Handle hSocket, uint8_t tableType, uint16_t dataStartAddress,
                         uint16_t numBits, std::span<uint8_t> readBuffer,
                         MBTReadCompleted callback = nullptr, uint32_t callbackContext = 0);
    // Holding registers: numWords 1 to 123.
    int32_t MBTWriteRegisters(Handle hSocket, uint16_t dataStartAddress, uint16_t numWords,
                              std::span<const uint8_t> writeBuffer,
                              MBTWriteCompleted callback = nullptr, uint32_t callbackContext = 0);
    // Coils: numBits 1 to 1968.
    int32_t MBTWriteCoils(Handle hSocket, uint16_t dataStartAddress, uint16_t numBits,
                          std::span<const uint8_t> writeBuffer,
                          MBTWriteCompleted callback = nullptr, uint32_t callbackContext = 0);

    static uint16_t MBTSwapWord(uint16_t wData) {
        return static_cast<uint16_t>((wData << 8) | (wData >> 8));
    }
    static uint32_t MBTSwapDWord(uint32_t dwData) {
        return (dwData << 24) | ((dwData & 0xFF00u) << 8) | ((dwData >> 8) & 0xFF00u) |
               (dwData >> 24);
    }

    // libmodbus's text for the cause of the last failed call ("Connection refused"), or the
    // status text when the library refused the call itself.
    const std::string& LastErrorText() const { return lastError_; }
    // Connections made and not yet disconnected (closed ones included).
    size_t OpenConnections() const { return connections_.size(); }

  private:
    struct Connection;

    // The connection of a handle that can take a request, or the status why not.
    int32_t usable(Handle hSocket, Connection*& connection);
    // The status of a libmodbus call that failed with errno `error`; closes the connection
    // unless the coupler answered with an exception.
    int32_t failed(Connection& connection, int error);
    int32_t refuse(int32_t status);

    PortMap portMap_;
    int32_t initCount_ = 0;
    Handle nextHandle_ = 1;
    std::map<Handle, std::unique_ptr<Connection>> connections_;
    std::string lastError_;
};

}  // namespace maroset::platform
