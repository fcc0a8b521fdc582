#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "lang/VbArray.h"

namespace maroset {

// The language's string functions, on text as bytes. Positions count from 1, as the system's
// address and frame layouts are written; a start position below 1 or a negative length fails
// with Invalid procedure call or argument (5), as the language's functions do.

std::string UCase(std::string_view s);  // ASCII letters only
std::string LCase(std::string_view s);
std::string Left(std::string_view s, int32_t length);
std::string Right(std::string_view s, int32_t length);
// From `start` to the end, or at most `length` bytes; "" when start is past the end.
std::string Mid(std::string_view s, int32_t start);
std::string Mid(std::string_view s, int32_t start, int32_t length);
// The position of `find` in `s` at or after `start`, 0 when it is not there. An empty `s`
// gives 0; an empty `find` gives `start`.
int32_t InStr(int32_t start, std::string_view s, std::string_view find);
int32_t InStr(std::string_view s, std::string_view find);
std::string Trim(std::string_view s);  // blanks only, as the language trims
// The pieces between the delimiters, zero-based; empty text gives an empty array (upper
// bound -1), and neighbouring delimiters an empty piece.
VbArray<std::string> Split(std::string_view s, std::string_view delimiter);

}  // namespace maroset
