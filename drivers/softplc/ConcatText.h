#pragma once

#include <string>

#include "lang/Conversions.h"
#include "lang/Variant.h"

namespace maroset {

// A value as text the way string concatenation takes it: Null and Empty add nothing, text
// is itself, anything else is CStr's text (an array fails with Type mismatch).
inline std::string ConcatText(const Variant& value) {
    if (value.isString()) return value.string();
    if (value.isNull()) return {};
    return CStr(value);
}

}  // namespace maroset
