#pragma once

#include <string>
#include <string_view>

namespace maroset::platform {

// The words link incidents show bytes in. A dump of more than DumpWhole bytes keeps its first
// DumpHead and last DumpTail bytes and says how many it left out between them, so one line of
// a flood stays readable; shorter dumps are shown whole.
inline constexpr size_t DumpWhole = 256;
inline constexpr size_t DumpHead = 128;
inline constexpr size_t DumpTail = 32;

// Bytes as hexadecimal pairs separated by blanks ("10 02 01 00").
std::string Hex(std::string_view bytes);
// Text with control characters and bytes from 0x7F up shown as <CR>, <0x05>, ...
std::string Printable(std::string_view text);

}  // namespace maroset::platform
