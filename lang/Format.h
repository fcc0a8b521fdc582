#pragma once

#include <string>
#include <string_view>

#include "lang/Variant.h"

namespace maroset {

// The language's Format for the patterns the system uses:
//   "000"     a whole number, at least three digits, zero-padded ("005", "1234", "-007")
//   "@@@"     text right-aligned in at least three characters ("  5")
//   "###0"    a whole number, no padding
//   "###0.0"  one decimal
// Numbers round half away from zero here (unlike the conversions). Numeric text is read as
// a number for the numeric patterns; Null formats as "". Any other pattern fails with
// Invalid procedure call or argument (5).
std::string Format(const Variant& value, std::string_view pattern);

}  // namespace maroset
