#include "lang/Format.h"

#include <charconv>
#include <cmath>
#include <cstdlib>

#include "lang/Conversions.h"

namespace maroset {

namespace {

// A number as the decimal text it displays as: the digits of its integer part and of its
// fraction, without sign. Singles keep 7 significant digits and Doubles 15, as CStr shows
// them, so that 2.25 rounds as the 2.25 it looks like.
struct Decimal {
    bool negative = false;
    std::string whole;     // at least one digit
    std::string fraction;  // may be empty
};

Decimal toDecimal(double d, int significant) {
    Decimal out;
    out.negative = std::signbit(d) && d != 0.0;
    if (d == 0.0) {
        out.whole = "0";
        return out;
    }
    char buf[48];
    const auto res = std::to_chars(buf, buf + sizeof buf - 1, std::fabs(d),
                                   std::chars_format::scientific, significant - 1);
    *res.ptr = '\0';
    // buf is "d.ddddde+XX".
    std::string digits;
    const char* p = buf;
    for (; *p && *p != 'e'; ++p)
        if (*p != '.') digits += *p;
    const int exponent = std::atoi(p + 1);
    if (exponent >= 0) {
        const size_t wholeLen = static_cast<size_t>(exponent) + 1;
        if (digits.size() < wholeLen) digits.append(wholeLen - digits.size(), '0');
        out.whole = digits.substr(0, wholeLen);
        out.fraction = digits.substr(wholeLen);
    } else {
        out.whole = "0";
        out.fraction = std::string(static_cast<size_t>(-exponent - 1), '0') + digits;
    }
    return out;
}

Decimal toDecimal(const Variant& v) {
    switch (v.type()) {
        case VarType::Integer:
        case VarType::Long:
        case VarType::Boolean: {
            const int64_t n = CLng(v);
            Decimal out;
            out.negative = n < 0;
            out.whole = std::to_string(n < 0 ? -n : n);
            return out;
        }
        case VarType::Single:
            return toDecimal(static_cast<double>(v.single()), 7);
        default:
            return toDecimal(CDbl(v), 15);
    }
}

// Rounds to `decimals` fraction digits, half away from zero (the sign is kept apart).
void roundHalfAway(Decimal& d, size_t decimals) {
    if (d.fraction.size() <= decimals) {
        d.fraction.append(decimals - d.fraction.size(), '0');
        return;
    }
    const bool up = d.fraction[decimals] >= '5';
    d.fraction.resize(decimals);
    if (!up) return;
    std::string all = d.whole + d.fraction;
    size_t i = all.size();
    while (i > 0) {
        --i;
        if (all[i] == '9') {
            all[i] = '0';
        } else {
            ++all[i];
            break;
        }
        if (i == 0) all.insert(all.begin(), '1');
    }
    d.whole = all.substr(0, all.size() - decimals);
    d.fraction = all.substr(all.size() - decimals);
}

std::string formatNumber(const Variant& value, size_t minWholeDigits, size_t decimals) {
    Decimal d = toDecimal(value);
    roundHalfAway(d, decimals);
    const size_t first = d.whole.find_first_not_of('0');
    d.whole = first == std::string::npos ? std::string() : d.whole.substr(first);
    if (d.whole.size() < minWholeDigits) d.whole.insert(0, minWholeDigits - d.whole.size(), '0');
    // A negative value that rounds to zero keeps its sign ("-0", "-0.0"), as the language's
    // Format shows it; this is intended.
    std::string out = d.negative ? "-" : "";
    out += d.whole;
    if (decimals > 0) out += "." + d.fraction;
    return out;
}

}  // namespace

std::string Format(const Variant& value, std::string_view pattern) {
    if (value.isNull()) return {};
    if (value.isArray() || value.isObject()) throw VbError(err::TypeMismatch);

    size_t minWhole = 0, decimals = 0;
    if (pattern == "@@@") {
        std::string text = CStr(value);
        if (text.size() < 3) text.insert(0, 3 - text.size(), ' ');
        return text;
    } else if (pattern == "000") {
        minWhole = 3;
    } else if (pattern == "###0") {
        minWhole = 1;
    } else if (pattern == "###0.0") {
        minWhole = 1;
        decimals = 1;
    } else {
        throw VbError(err::InvalidProcedureCall);
    }
    // Text that is not a number is shown as it is.
    if (value.isString() && !IsNumeric(value)) return value.string();
    // Infinities and NaN cannot come from the system's own arithmetic; show them as CStr does.
    if ((value.type() == VarType::Double && !std::isfinite(value.dbl())) ||
        (value.type() == VarType::Single && !std::isfinite(value.single())))
        return CStr(value);
    return formatNumber(value, minWhole, decimals);
}

}  // namespace maroset
