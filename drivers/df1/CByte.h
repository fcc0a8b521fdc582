#pragma once

#include <cstdint>

#include "lang/Conversions.h"
#include "lang/Variant.h"
#include "lang/VbError.h"

namespace maroset {

// The language's CByte, as assigning a value to a Byte does: whole numbers 0..255 (rounded
// half to even), Overflow (6) outside, Type mismatch (13) for text that is not a number.
inline uint8_t CByte(const Variant& v) {
    const int32_t n = CLng(v);
    if (n < 0 || n > 255) throw VbError(err::Overflow);
    return static_cast<uint8_t>(n);
}

}  // namespace maroset
