#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "lang/Variant.h"

namespace maroset {

// The language's conversion functions. Numbers convert to integers with banker's rounding
// (2.5 -> 2, 3.5 -> 4); a result outside the target's range fails with Overflow (6); text
// that is not a number fails with Type mismatch (13); Null fails with Invalid use of Null
// (94); Empty converts to 0, "" or False. Text is read as the language reads numbers: blanks
// around it, a sign, thousands separators, a decimal point, an exponent (E or D), and
// "&H" / "&O" prefixes.
uint8_t CByte(const Variant& v);  // 0..255
int16_t CInt(const Variant& v);
int32_t CLng(const Variant& v);
float CSng(const Variant& v);
double CDbl(const Variant& v);
// Single: at most 7 significant digits; Double: at most 15; Boolean: "True" / "False";
// large and small magnitudes in the E notation ("1E+20", "1.5E-05"); Date: "M/D/YYYY
// h:mm:ss AM/PM", the date alone at midnight and the time alone on 12/30/1899.
std::string CStr(const Variant& v);
// A date serial (see Variant::FromDate): a Date as it is, a number as the serial it is, text
// as a number or in the Date's text form ("M/D/YYYY", "h:mm:ss AM/PM" or both).
double CDate(const Variant& v);
// Numbers: non-zero is True; text: "True" / "False" in any letter case, or a number.
bool CBool(const Variant& v);

// Reads text as the language reads a number; nothing when it is not one.
std::optional<double> ParseNumber(std::string_view text);
// The language's IsNumeric: a number, Empty, or text that reads as a number.
bool IsNumeric(const Variant& v);

// Result of comparing two Variants as the language's comparison operators do.
enum class Ordering { Less = -1, Equal = 0, Greater = 1, Null = 2 };

// Comparison of two Variants: numbers by value (True is -1), text by its bytes, Empty as 0
// against a number and as "" against text, a number below any text, and Null against
// anything yields Null.
Ordering Compare(const Variant& a, const Variant& b);

}  // namespace maroset
