#include "platform/JetLike.h"

#include <cstddef>

#include "lang/VbError.h"

namespace maroset::platform {
namespace {

unsigned char Lower(unsigned char c) {
    if (c >= 'A' && c <= 'Z') return static_cast<unsigned char>(c + 32);
    // Latin-1 capitals À..Þ, except the multiplication sign.
    if (c >= 0xC0 && c <= 0xDE && c != 0xD7) return static_cast<unsigned char>(c + 32);
    return c;
}

unsigned char Upper(unsigned char c) {
    if (c >= 'a' && c <= 'z') return static_cast<unsigned char>(c - 32);
    if (c >= 0xE0 && c <= 0xFE && c != 0xF7) return static_cast<unsigned char>(c - 32);
    return c;
}

[[noreturn]] void Invalid() {
    throw VbError(InvalidPatternString, "Invalid pattern string");
}

// One element of a pattern, read in place: the pattern is matched against every row of a
// query, so it is never copied or compiled into anything that allocates.
struct Token {
    enum Kind { Star, Any, Digit, Set, Char, Nothing } kind;
    unsigned char ch = 0;               // Char
    bool negate = false;                // Set
    size_t listBegin = 0, listEnd = 0;  // Set: the list between the brackets
    size_t next = 0;                    // where the following token starts
};

class Pattern {
  public:
    Pattern(std::string_view p, std::optional<char> escape) : p_(p), escape_(escape) {}

    size_t size() const { return p_.size(); }

    Token at(size_t k) const {
        Token t{Token::Char};
        const char c = p_[k];
        t.next = k + 1;
        if (isEscape(c)) {
            if (k + 1 == p_.size()) Invalid();
            t.ch = static_cast<unsigned char>(p_[k + 1]);
            t.next = k + 2;
            return t;
        }
        switch (c) {
            case '*':
                t.kind = Token::Star;
                return t;
            case '?':
                t.kind = Token::Any;
                return t;
            case '#':
                t.kind = Token::Digit;
                return t;
            case '[':
                break;
            default:
                t.ch = static_cast<unsigned char>(c);
                return t;
        }
        size_t j = k + 1;
        if (j < p_.size() && p_[j] == '!') {
            t.negate = true;
            ++j;
        }
        t.listBegin = j;
        for (;;) {
            if (j >= p_.size()) Invalid();  // no closing bracket
            if (p_[j] == ']') break;
            j = item(j, nullptr, nullptr);
        }
        t.listEnd = j;
        t.next = j + 1;
        // [] takes no character at all; [!] is any one character.
        t.kind = t.listBegin == t.listEnd && !t.negate ? Token::Nothing : Token::Set;
        return t;
    }

    bool matches(const Token& t, unsigned char c) const {
        switch (t.kind) {
            case Token::Any:
                return true;
            case Token::Digit:
                return c >= '0' && c <= '9';
            case Token::Char:
                return Lower(c) == Lower(t.ch);
            case Token::Set: {
                // A range holds a letter when it holds either case of it: [a-z] takes "Q".
                bool in = false;
                for (size_t j = t.listBegin; j < t.listEnd && !in;) {
                    unsigned char lo = 0, hi = 0;
                    j = item(j, &lo, &hi);
                    auto holds = [&](unsigned char x) { return x >= lo && x <= hi; };
                    in = holds(c) || holds(Lower(c)) || holds(Upper(c));
                }
                return in != t.negate;
            }
            case Token::Star:
            case Token::Nothing:
                break;
        }
        return false;
    }

  private:
    bool isEscape(char c) const { return escape_ && c == *escape_; }

    // One item of a list at j: a character or a range "a-z"; returns where the next starts.
    // A '-' first or last in the list is itself.
    size_t item(size_t j, unsigned char* lo, unsigned char* hi) const {
        auto one = [&](size_t& at) {
            if (isEscape(p_[at])) {
                if (at + 1 >= p_.size()) Invalid();
                ++at;
            }
            return static_cast<unsigned char>(p_[at++]);
        };
        const unsigned char first = one(j);
        unsigned char last = first;
        if (j + 1 < p_.size() && p_[j] == '-' && p_[j + 1] != ']') {
            ++j;
            last = one(j);
            if (last < first) Invalid();
        }
        if (lo) *lo = first;
        if (hi) *hi = last;
        return j;
    }

    std::string_view p_;
    std::optional<char> escape_;
};

}  // namespace

bool JetPlainPattern(std::string_view pattern, std::optional<char> escape) {
    return pattern.find_first_of("*?#[") == std::string_view::npos &&
           (!escape || pattern.find(*escape) == std::string_view::npos);
}

bool JetSameText(std::string_view text, std::string_view pattern) {
    if (text.size() != pattern.size()) return false;
    for (size_t i = 0; i < text.size(); ++i)
        if (Lower(static_cast<unsigned char>(text[i])) !=
            Lower(static_cast<unsigned char>(pattern[i])))
            return false;
    return true;
}

bool JetLike(std::string_view text, std::string_view pattern, std::optional<char> escape) {
    if (JetPlainPattern(pattern, escape)) return JetSameText(text, pattern);
    const Pattern p(pattern, escape);
    // A malformed pattern fails whatever the text, so read it all once first.
    for (size_t k = 0; k < p.size(); k = p.at(k).next) {
    }
    // Every token but the star takes exactly one character (or none, for []), so the classic
    // scan that backs up to the last star is exact.
    size_t t = 0, k = 0;
    size_t afterStar = SIZE_MAX, starText = 0;
    while (t < text.size()) {
        if (k < p.size()) {
            const Token token = p.at(k);
            if (token.kind == Token::Star) {
                afterStar = k = token.next;
                starText = t;
                continue;
            }
            if (token.kind == Token::Nothing) {
                k = token.next;
                continue;
            }
            if (p.matches(token, static_cast<unsigned char>(text[t]))) {
                k = token.next;
                ++t;
                continue;
            }
        }
        if (afterStar == SIZE_MAX) return false;
        k = afterStar;
        t = ++starText;
    }
    while (k < p.size()) {
        const Token token = p.at(k);
        if (token.kind != Token::Star && token.kind != Token::Nothing) return false;
        k = token.next;
    }
    return true;
}

}  // namespace maroset::platform
