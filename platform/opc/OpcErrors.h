#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "lang/VbError.h"

namespace maroset::platform {

// The result codes (HRESULTs) of the OPC Data Access interfaces, as signed 32-bit numbers the
// way the automation objects hand them out in their Errors arrays, and as the run-time error
// numbers a failed automation call raises.
namespace opc {

inline constexpr int32_t Code(uint32_t hresult) {
    return static_cast<int32_t>(hresult);
}

inline constexpr int32_t S_OK = 0;
// From the OPC Data Access standard's error list.
inline constexpr int32_t OPC_E_INVALIDHANDLE = Code(0xC0040001);
inline constexpr int32_t OPC_E_BADTYPE = Code(0xC0040004);
inline constexpr int32_t OPC_E_PUBLIC = Code(0xC0040005);
inline constexpr int32_t OPC_E_BADRIGHTS = Code(0xC0040006);
inline constexpr int32_t OPC_E_UNKNOWNITEMID = Code(0xC0040007);
inline constexpr int32_t OPC_E_INVALIDITEMID = Code(0xC0040008);
inline constexpr int32_t OPC_E_INVALIDFILTER = Code(0xC0040009);
inline constexpr int32_t OPC_E_UNKNOWNPATH = Code(0xC004000A);
inline constexpr int32_t OPC_E_RANGE = Code(0xC004000B);
inline constexpr int32_t OPC_E_DUPLICATENAME = Code(0xC004000C);
inline constexpr int32_t OPC_S_UNSUPPORTEDRATE = Code(0x0004000D);
inline constexpr int32_t OPC_S_CLAMP = Code(0x0004000E);
inline constexpr int32_t OPC_E_INVALIDCONFIGFILE = Code(0xC0040010);
inline constexpr int32_t OPC_E_NOTFOUND = Code(0xC0040011);
inline constexpr int32_t OPC_E_INVALID_PID = Code(0xC0040203);
// General COM results the automation objects also use.
inline constexpr int32_t E_FAIL = Code(0x80004005);
inline constexpr int32_t E_INVALIDARG = Code(0x80070057);
inline constexpr int32_t CO_E_CLASSSTRING = Code(0x800401F3);

// Item qualities (the quality word of the OPC Data Access standard).
inline constexpr int32_t OPC_QUALITY_BAD = 0x00;
inline constexpr int32_t OPC_QUALITY_UNCERTAIN = 0x40;
inline constexpr int32_t OPC_QUALITY_GOOD = 0xC0;  // 192
// Bad qualities with their sub-status, as servers that lose their source report them.
inline constexpr int32_t OPC_QUALITY_CONFIG_ERROR = 0x04;
inline constexpr int32_t OPC_QUALITY_NOT_CONNECTED = 0x08;
inline constexpr int32_t OPC_QUALITY_COMM_FAILURE = 0x18;
inline constexpr int32_t OPC_QUALITY_OUT_OF_SERVICE = 0x1C;

// The text of a result code as a Windows server gives it from its message table: the
// standard's wording followed by CR LF ("The value of the handle is invalid.\r\n"). Nothing
// for a code it does not know.
std::optional<std::string> StandardErrorText(int32_t code);

// "0xC0040007", for traces and messages.
std::string HexCode(int32_t code);

// The run-time error a failed automation call raises: the result code as its number, the
// code's text (without the line end) or `description` as its description, `source` the
// object that failed ("OPCGroup").
VbError Failure(int32_t code, std::string source, std::string description = {});

}  // namespace opc

}  // namespace maroset::platform
