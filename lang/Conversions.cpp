#include "lang/Conversions.h"

#include <charconv>
#include <cmath>
#include <cstdio>
#include <limits>
#include <optional>

#include "lang/Strings.h"
#include "lang/VbError.h"

namespace maroset {

namespace {

bool isBlank(char c) {
    return c == ' ' || c == '\t' || c == '\r' || c == '\n' || c == '\v' || c == '\f';
}

std::string_view trimBlanks(std::string_view s) {
    while (!s.empty() && isBlank(s.front())) s.remove_prefix(1);
    while (!s.empty() && isBlank(s.back())) s.remove_suffix(1);
    return s;
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

int hexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    return -1;
}

// "&H..." and "&O...". A value that fits in 16 bits is an Integer and one that fits in 32
// bits a Long, both read as signed: "&HFFFF" is -1 and "&H8000" is -32768, as the
// language's literals are. Larger values overflow.
std::optional<double> parseRadix(std::string_view s) {
    if (s.size() < 3 || s[0] != '&') return std::nullopt;
    const char kind = s[1];
    int base;
    if (kind == 'H' || kind == 'h') {
        base = 16;
    } else if (kind == 'O' || kind == 'o') {
        base = 8;
    } else {
        return std::nullopt;
    }
    uint64_t value = 0;
    bool tooBig = false;
    for (char c : s.substr(2)) {
        const int d = hexDigit(c);
        if (d < 0 || d >= base) return std::nullopt;
        value = value * static_cast<uint64_t>(base) + static_cast<uint64_t>(d);
        if (value > 0xFFFFFFFFull) {
            tooBig = true;
            value = 0x100000000ull;  // keeps the accumulator from wrapping on long input
        }
    }
    if (tooBig) return std::numeric_limits<double>::infinity();
    if (value <= 0xFFFFu) return static_cast<double>(static_cast<int16_t>(value));
    return static_cast<double>(static_cast<int32_t>(static_cast<uint32_t>(value)));
}

// The value a conversion works on: Empty is 0, True is -1, text is read as a number.
double numericValue(const Variant& v) {
    switch (v.type()) {
        case VarType::Empty:
            return 0.0;
        case VarType::Null:
            throw VbError(err::InvalidUseOfNull);
        case VarType::Integer:
            return v.integer();
        case VarType::Long:
            return v.lng();
        case VarType::Single:
            return v.single();
        case VarType::Double:
            return v.dbl();
        case VarType::Date:
            return v.date();
        case VarType::Boolean:
            return v.boolean() ? -1.0 : 0.0;
        case VarType::String: {
            const auto n = ParseNumber(v.string());
            if (!n) throw VbError(err::TypeMismatch);
            if (!std::isfinite(*n)) throw VbError(err::Overflow);
            return *n;
        }
        default:
            throw VbError(err::TypeMismatch);
    }
}

// Days since 12/30/1899 from a civil date, and back (proleptic Gregorian calendar).
int64_t daysFromCivil(int64_t y, unsigned m, unsigned d) {
    y -= m <= 2;
    const int64_t era = (y >= 0 ? y : y - 399) / 400;
    const auto yoe = static_cast<unsigned>(y - era * 400);
    const unsigned doy = (153 * (m > 2 ? m - 3 : m + 9) + 2) / 5 + d - 1;
    const unsigned doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
    return era * 146097 + static_cast<int64_t>(doe) - 719468 + 25569;
}

void civilFromDays(int64_t serial, int64_t& y, unsigned& m, unsigned& d) {
    const int64_t z = serial - 25569 + 719468;
    const int64_t era = (z >= 0 ? z : z - 146096) / 146097;
    const auto doe = static_cast<unsigned>(z - era * 146097);
    const unsigned yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
    const unsigned doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
    const unsigned mp = (5 * doy + 2) / 153;
    d = doy - (153 * mp + 2) / 5 + 1;
    m = mp < 10 ? mp + 3 : mp - 9;
    y = static_cast<int64_t>(yoe) + era * 400 + (m <= 2);
}

// "M/D/YYYY h:mm:ss AM/PM"; the date alone at midnight, the time alone on day 0.
std::string dateText(double serial) {
    if (!std::isfinite(serial)) throw VbError(err::Overflow);
    const double whole = std::trunc(serial);
    // The fraction counts the time forward even for dates before day 0.
    auto seconds = static_cast<int64_t>(std::llround(std::fabs(serial - whole) * 86400.0));
    auto day = static_cast<int64_t>(whole);
    if (seconds >= 86400) {
        seconds -= 86400;
        day += serial < 0 ? -1 : 1;
    }
    char buf[64];
    std::string text;
    if (day != 0 || seconds == 0) {
        int64_t y;
        unsigned m, d;
        civilFromDays(day, y, m, d);
        std::snprintf(buf, sizeof buf, "%u/%u/%lld", m, d, static_cast<long long>(y));
        text = buf;
    }
    if (seconds != 0) {
        const auto h = static_cast<int>(seconds / 3600);
        std::snprintf(buf, sizeof buf, "%d:%02d:%02d %s", h % 12 == 0 ? 12 : h % 12,
                      static_cast<int>(seconds / 60 % 60), static_cast<int>(seconds % 60),
                      h < 12 ? "AM" : "PM");
        if (!text.empty()) text += ' ';
        text += buf;
    }
    return text;
}

// The Date's own text form back to a serial; nothing for other text.
std::optional<double> parseDate(std::string_view text) {
    std::string s(trimBlanks(text));
    unsigned m = 0, d = 0, h = 0, mi = 0, sec = 0;
    long long y = 0;
    char ampm[3] = {};
    int used = 0;
    double serial = 0;
    bool any = false;
    if (std::sscanf(s.c_str(), "%u/%u/%lld%n", &m, &d, &y, &used) == 3) {
        if (m < 1 || m > 12 || d < 1 || d > 31 || y < 100 || y > 9999) return std::nullopt;
        serial = static_cast<double>(daysFromCivil(y, m, d));
        s.erase(0, static_cast<size_t>(used));
        s = std::string(trimBlanks(s));
        any = true;
    }
    if (!s.empty()) {
        if (std::sscanf(s.c_str(), "%u:%u:%u %2s%n", &h, &mi, &sec, ampm, &used) != 4 ||
            static_cast<size_t>(used) != s.size() || h < 1 || h > 12 || mi > 59 || sec > 59)
            return std::nullopt;
        const std::string half = UCase(ampm);
        if (half != "AM" && half != "PM") return std::nullopt;
        h = h % 12 + (half == "PM" ? 12 : 0);
        const double time = (h * 3600.0 + mi * 60.0 + sec) / 86400.0;
        serial = serial < 0 ? serial - time : serial + time;
        any = true;
    }
    if (!any) return std::nullopt;
    return serial;
}

// Round half to even, then check the range of the target.
double roundToRange(double d, double lo, double hi) {
    if (!std::isfinite(d)) throw VbError(err::Overflow);
    if (d < lo - 1.0 || d > hi + 1.0) throw VbError(err::Overflow);
    double r = std::floor(d);
    const double frac = d - r;
    if (frac > 0.5 || (frac == 0.5 && std::fmod(r, 2.0) != 0.0)) r += 1.0;
    if (r < lo || r > hi) throw VbError(err::Overflow);
    return r;
}

std::string formatG(double d, int digits) {
    if (std::isnan(d)) return "-1.#IND";
    if (std::isinf(d)) return d > 0 ? "1.#INF" : "-1.#INF";
    if (d == 0.0) return "0";  // also -0
    // to_chars rather than printf: the host's locale must not change the decimal point.
    char buf[40];
    const auto res = std::to_chars(buf, buf + sizeof buf, d, std::chars_format::general, digits);
    std::string out(buf, res.ptr);
    for (char& c : out)
        if (c == 'e') c = 'E';
    return out;
}

}  // namespace

std::optional<double> ParseNumber(std::string_view text) {
    const std::string_view s = trimBlanks(text);
    if (s.empty()) return std::nullopt;
    if (s[0] == '&') return parseRadix(s);

    size_t i = 0;
    bool negative = false;
    if (s[i] == '+' || s[i] == '-') negative = s[i++] == '-';

    // Plain whole numbers (handles, counts) are most of the text that is converted: up to 15
    // digits are exact in a Double, so they need no text for from_chars.
    if (s.size() - i <= 15 && s.size() > i &&
        s.find_first_not_of("0123456789", i) == std::string_view::npos) {
        int64_t whole = 0;
        for (; i < s.size(); ++i) whole = whole * 10 + (s[i] - '0');
        const double value = static_cast<double>(whole);
        return negative ? -value : value;
    }

    // Mantissa digits without separators, and where the point falls.
    std::string clean;
    clean.reserve(s.size());
    size_t intDigits = 0, fracDigits = 0;
    while (i < s.size()) {
        if (isDigit(s[i])) {
            clean += s[i++];
            ++intDigits;
        } else if (s[i] == ',' && intDigits > 0 && i + 1 < s.size() && isDigit(s[i + 1])) {
            ++i;  // thousands separator
        } else {
            break;
        }
    }
    if (i < s.size() && s[i] == '.') {
        ++i;
        clean += '.';
        while (i < s.size() && isDigit(s[i])) {
            clean += s[i++];
            ++fracDigits;
        }
    }
    if (intDigits + fracDigits == 0) return std::nullopt;

    int64_t exponent = 0;
    if (i < s.size() && (s[i] == 'E' || s[i] == 'e' || s[i] == 'D' || s[i] == 'd')) {
        ++i;
        bool expNegative = false;
        if (i < s.size() && (s[i] == '+' || s[i] == '-')) expNegative = s[i++] == '-';
        if (i >= s.size() || !isDigit(s[i])) return std::nullopt;
        while (i < s.size() && isDigit(s[i])) {
            if (exponent < 100000) exponent = exponent * 10 + (s[i] - '0');
            ++i;
        }
        if (expNegative) exponent = -exponent;
    }
    if (i != s.size()) return std::nullopt;

    clean += 'e';
    clean += std::to_string(exponent);
    double value = 0.0;
    const auto res = std::from_chars(clean.data(), clean.data() + clean.size(), value);
    if (res.ec == std::errc::result_out_of_range) {
        // Too large or too small for a Double: decide which by the decimal magnitude.
        const size_t firstNonZero = clean.find_first_of("123456789");
        const size_t point = clean.find('.');
        const int64_t pointPos =
            static_cast<int64_t>(point == std::string::npos ? clean.find('e') : point);
        int64_t magnitude = pointPos - static_cast<int64_t>(firstNonZero) + exponent;
        if (static_cast<int64_t>(firstNonZero) > pointPos) ++magnitude;
        value = magnitude > 0 ? std::numeric_limits<double>::infinity() : 0.0;
    } else if (res.ec != std::errc()) {
        return std::nullopt;
    }
    return negative ? -value : value;
}

bool IsNumeric(const Variant& v) {
    switch (v.type()) {
        case VarType::Empty:
        case VarType::Integer:
        case VarType::Long:
        case VarType::Single:
        case VarType::Double:
        case VarType::Boolean:
            return true;
        case VarType::String: {
            const auto n = ParseNumber(v.string());
            return n && std::isfinite(*n);
        }
        default:
            return false;
    }
}

uint8_t CByte(const Variant& v) {
    const int32_t n = CLng(v);
    if (n < 0 || n > 255) throw VbError(err::Overflow);
    return static_cast<uint8_t>(n);
}

int16_t CInt(const Variant& v) {
    if (v.type() == VarType::Integer) return v.integer();
    return static_cast<int16_t>(roundToRange(numericValue(v), -32768.0, 32767.0));
}

int32_t CLng(const Variant& v) {
    switch (v.type()) {
        case VarType::Integer:
            return v.integer();
        case VarType::Long:
            return v.lng();
        default:
            return static_cast<int32_t>(roundToRange(numericValue(v), -2147483648.0, 2147483647.0));
    }
}

float CSng(const Variant& v) {
    if (v.type() == VarType::Single) return v.single();
    const double d = numericValue(v);
    // Beyond the largest Single plus half a unit the value would round to infinity.
    if (!std::isfinite(d) || std::fabs(d) >= 3.4028235677973366e38) throw VbError(err::Overflow);
    return static_cast<float>(d);
}

double CDbl(const Variant& v) {
    const double d = numericValue(v);
    if (!std::isfinite(d)) throw VbError(err::Overflow);
    return d;
}

std::string CStr(const Variant& v) {
    switch (v.type()) {
        case VarType::Empty:
            return {};
        case VarType::Null:
            throw VbError(err::InvalidUseOfNull);
        case VarType::Integer:
            return std::to_string(v.integer());
        case VarType::Long:
            return std::to_string(v.lng());
        case VarType::Single:
            return formatG(v.single(), 7);
        case VarType::Double:
            return formatG(v.dbl(), 15);
        case VarType::Date:
            return dateText(v.date());
        case VarType::String:
            return v.string();
        case VarType::Boolean:
            return v.boolean() ? "True" : "False";
        default:
            throw VbError(err::TypeMismatch);
    }
}

double CDate(const Variant& v) {
    if (v.type() == VarType::Date) return v.date();
    if (v.isString()) {
        if (const auto serial = parseDate(v.string())) return *serial;
    }
    const double d = numericValue(v);
    // The language's dates run from year 100 to year 9999.
    if (!std::isfinite(d) || d < -657434.0 || d >= 2958466.0) throw VbError(err::Overflow);
    return d;
}

bool CBool(const Variant& v) {
    switch (v.type()) {
        case VarType::Boolean:
            return v.boolean();
        case VarType::String: {
            const std::string_view s = trimBlanks(v.string());
            auto equalsNoCase = [&](std::string_view word) {
                if (s.size() != word.size()) return false;
                for (size_t i = 0; i < s.size(); ++i) {
                    char c = s[i];
                    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
                    if (c != word[i]) return false;
                }
                return true;
            };
            if (equalsNoCase("true")) return true;
            if (equalsNoCase("false")) return false;
            return numericValue(v) != 0.0;
        }
        default:
            return numericValue(v) != 0.0;
    }
}

namespace {

int compareNumbers(double a, double b) {
    // NaN sorts below every number and equal to itself, so the order stays total.
    const bool na = std::isnan(a), nb = std::isnan(b);
    if (na || nb) return na == nb ? 0 : (na ? -1 : 1);
    return a < b ? -1 : (a > b ? 1 : 0);
}

Ordering toOrdering(int c) {
    return c < 0 ? Ordering::Less : (c > 0 ? Ordering::Greater : Ordering::Equal);
}

}  // namespace

Ordering Compare(const Variant& a, const Variant& b) {
    if (a.isArray() || a.isObject() || b.isArray() || b.isObject())
        throw VbError(err::TypeMismatch);
    if (a.isNull() || b.isNull()) return Ordering::Null;
    if (a.isEmpty() && b.isEmpty()) return Ordering::Equal;

    const bool aText = a.isString() || (a.isEmpty() && b.isString());
    const bool bText = b.isString() || (b.isEmpty() && a.isString());
    if (aText && bText) {
        static const std::string empty;
        const std::string& sa = a.isString() ? a.string() : empty;
        const std::string& sb = b.isString() ? b.string() : empty;
        return toOrdering(sa.compare(sb));
    }
    // A number is below any text.
    if (aText) return Ordering::Greater;
    if (bText) return Ordering::Less;
    return toOrdering(compareNumbers(numericValue(a), numericValue(b)));
}

}  // namespace maroset
