#pragma once

#include <cstdint>
#include <string>

namespace maroset::platform::sck {

// Error numbers of the TCP socket control, as hosts and logs know them. The asynchronous ones
// (connect refused, reset, host not found, ...) arrive through the control's Error event; the
// others fail the call that caused them.
inline constexpr int32_t InvalidPropertyValue = 380;   // RemotePort outside 0..65535
inline constexpr int32_t AddressInUse = 10048;         //
inline constexpr int32_t AddressNotAvailable = 10049;  // port 0, or an address not usable
inline constexpr int32_t NetworkSubsystemFailed = 10050;
inline constexpr int32_t NetworkUnreachable = 10051;  // also "no route to host"
inline constexpr int32_t ConnectAborted = 10053;
inline constexpr int32_t ConnectionReset = 10054;  // the peer reset the connection
inline constexpr int32_t NoBufferSpace = 10055;
inline constexpr int32_t NotConnected = 10057;
inline constexpr int32_t Timedout = 10060;           // no answer to the connect
inline constexpr int32_t ConnectionRefused = 10061;  // nobody listens at the port
inline constexpr int32_t HostNotFound = 11001;
inline constexpr int32_t HostNotFoundTryAgain = 11002;
inline constexpr int32_t NonRecoverableError = 11003;
inline constexpr int32_t NoData = 11004;
inline constexpr int32_t BadState = 40006;   // SendData while not connected
inline constexpr int32_t InvalidOp = 40020;  // Connect while not closed

// The control's text for one of its error numbers ("Connection is forcefully rejected").
std::string Description(int32_t number);

// The control's number for an errno value from connect(), send() or recv().
int32_t FromErrno(int error);
// The control's number for a getaddrinfo() result.
int32_t FromResolver(int gaiError);

}  // namespace maroset::platform::sck
