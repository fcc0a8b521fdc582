#pragma once

#include <cstdint>
#include <string>

// The status results of the MBT functions (MbtLibrary). 0 is success. A status from 1 to 255
// is the Modbus exception code the coupler answered with, as the Modbus application protocol
// numbers them (2: Illegal data address). The library's own failures lie from 0x100 up; their
// values are this library's own.
namespace maroset::platform::mbt {

inline constexpr int32_t Ok = 0;

// Modbus exception codes a coupler may answer with (Modbus application protocol).
inline constexpr int32_t IllegalFunction = 0x01;
inline constexpr int32_t IllegalDataAddress = 0x02;
inline constexpr int32_t IllegalDataValue = 0x03;
inline constexpr int32_t ServerDeviceFailure = 0x04;
inline constexpr int32_t Acknowledge = 0x05;
inline constexpr int32_t ServerDeviceBusy = 0x06;
inline constexpr int32_t MemoryParityError = 0x08;
inline constexpr int32_t GatewayPathUnavailable = 0x0A;
inline constexpr int32_t GatewayTargetFailed = 0x0B;

// MBTInit has not been called (or every MBTInit was matched by MBTExit).
inline constexpr int32_t NotInitialised = 0x101;
// An argument the call cannot use: a host address that is not an IPv4 address, a table type
// the call does not read, a count of 0 or above the Modbus limit, a buffer too small.
inline constexpr int32_t InvalidArgument = 0x102;
// No connection has this handle (never connected, or disconnected).
inline constexpr int32_t InvalidHandle = 0x103;
// A protocol selector other than 0 (TCP), or a completion callback: requests are only made
// synchronously.
inline constexpr int32_t NotSupported = 0x104;
// The coupler could not be reached: refused, unreachable, or no answer to the connect within
// the request time-out.
inline constexpr int32_t ConnectFailed = 0x105;
// No complete reply within the request time-out. The connection is closed.
inline constexpr int32_t Timeout = 0x106;
// The coupler closed or reset the connection, or the connection was closed after an earlier
// failure on it. Reconnect.
inline constexpr int32_t ConnectionClosed = 0x107;
// A reply that does not answer the request (wrong length, function, count or transaction).
// The connection is closed.
inline constexpr int32_t BadReply = 0x108;
// Any other failure of the link.
inline constexpr int32_t LinkError = 0x109;

// A short text for a status ("Illegal data address", "No reply within the time-out"); for a
// status it does not know, "Status " and the number.
std::string StatusText(int32_t status);

}  // namespace maroset::platform::mbt
