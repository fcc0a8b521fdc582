#include "cli/CommandTokenizer.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <limits>

#include "cli/BadCommand.h"
#include "lang/VbError.h"

namespace maroset::cli {

namespace {

bool isBlank(char c) {
    return c == ' ' || c == '\t';
}

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

bool equalsNoCase(std::string_view a, std::string_view b) {
    if (a.size() != b.size()) return false;
    for (size_t i = 0; i < a.size(); ++i) {
        if (std::tolower(static_cast<unsigned char>(a[i])) != b[i]) return false;
    }
    return true;
}

// [sign] digits
bool isInteger(std::string_view t) {
    size_t i = (!t.empty() && (t[0] == '+' || t[0] == '-')) ? 1 : 0;
    if (i == t.size()) return false;
    for (; i < t.size(); ++i) {
        if (!isDigit(t[i])) return false;
    }
    return true;
}

// [sign] (digits [. [digits]] | . digits) [e|E [sign] digits]
bool isDecimal(std::string_view t) {
    size_t i = (!t.empty() && (t[0] == '+' || t[0] == '-')) ? 1 : 0;
    size_t digits = 0;
    while (i < t.size() && isDigit(t[i])) ++i, ++digits;
    if (i < t.size() && t[i] == '.') {
        ++i;
        while (i < t.size() && isDigit(t[i])) ++i, ++digits;
    }
    if (digits == 0) return false;
    if (i < t.size() && (t[i] == 'e' || t[i] == 'E')) {
        ++i;
        if (i < t.size() && (t[i] == '+' || t[i] == '-')) ++i;
        size_t exponent = 0;
        while (i < t.size() && isDigit(t[i])) ++i, ++exponent;
        if (exponent == 0) return false;
    }
    return i == t.size();
}

double toDouble(const std::string& text) {
    errno = 0;
    const double value = std::strtod(text.c_str(), nullptr);
    if (!std::isfinite(value) || (errno == ERANGE && value != 0.0)) throw VbError(err::Overflow);
    return value;
}

}  // namespace

void CommandTokenizer::skipBlanks() {
    while (pos_ < line_.size() && isBlank(line_[pos_])) ++pos_;
}

bool CommandTokenizer::atEnd() {
    skipBlanks();
    return pos_ >= line_.size();
}

std::string CommandTokenizer::rest() {
    skipBlanks();
    std::string text(line_.substr(pos_));
    pos_ = line_.size();
    return text;
}

std::optional<CommandTokenizer::Word> CommandTokenizer::next() {
    if (atEnd()) return std::nullopt;
    Word word;
    if (line_[pos_] != '"') {
        const size_t start = pos_;
        while (pos_ < line_.size() && !isBlank(line_[pos_])) ++pos_;
        word.text = std::string(line_.substr(start, pos_ - start));
        return word;
    }
    word.quoted = true;
    ++pos_;
    for (;;) {
        if (pos_ >= line_.size()) throw BadCommand("missing closing quote");
        const char c = line_[pos_++];
        if (c == '"') break;
        if (c == '\\' && pos_ < line_.size() && (line_[pos_] == '"' || line_[pos_] == '\\')) {
            word.text += line_[pos_++];
            continue;
        }
        word.text += c;
    }
    if (pos_ < line_.size() && !isBlank(line_[pos_]))
        throw BadCommand("text right after a closing quote");
    return word;
}

Variant CommandTokenizer::ParseValue(const Word& word) {
    const std::string& t = word.text;
    if (word.quoted) return Variant(t);
    if (equalsNoCase(t, "true")) return Variant(true);
    if (equalsNoCase(t, "false")) return Variant(false);
    if (isInteger(t)) {
        const double value = toDouble(t);
        if (value >= std::numeric_limits<int32_t>::min() &&
            value <= std::numeric_limits<int32_t>::max()) {
            return Variant(static_cast<int32_t>(std::strtol(t.c_str(), nullptr, 10)));
        }
        return Variant(value);
    }
    if (isDecimal(t)) return Variant(toDouble(t));
    return Variant(t);
}

}  // namespace maroset::cli
