#include "platform/JetLike.h"

#include <cstdint>
#include <vector>

#include "core/VbError.h"

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

struct Range {
    unsigned char lo, hi;
    bool contains(unsigned char c) const { return c >= lo && c <= hi; }
};

struct Token {
    enum Kind { Star, Any, Digit, Set, Char };
    explicit Token(Kind k, unsigned char c = 0) : kind(k), ch(c) {}

    Kind kind;
    unsigned char ch = 0;       // Char
    bool negate = false;        // Set
    std::vector<Range> ranges;  // Set

    bool matches(unsigned char c) const {
        switch (kind) {
            case Any:
                return true;
            case Digit:
                return c >= '0' && c <= '9';
            case Char:
                return Lower(c) == Lower(ch);
            case Set: {
                // A range holds a letter when it holds either case of it: [a-z] takes "Q".
                bool in = false;
                for (const Range& r : ranges)
                    if (r.contains(c) || r.contains(Lower(c)) || r.contains(Upper(c))) {
                        in = true;
                        break;
                    }
                return in != negate;
            }
            case Star:
                break;
        }
        return false;
    }
};

[[noreturn]] void Invalid() {
    throw VbError(InvalidPatternString, "Invalid pattern string");
}

std::vector<Token> Compile(std::string_view p, std::optional<char> escape) {
    std::vector<Token> tokens;
    size_t i = 0;
    auto literal = [&](unsigned char c) { tokens.emplace_back(Token::Char, c); };
    while (i < p.size()) {
        const char c = p[i++];
        if (escape && c == *escape) {
            if (i == p.size()) Invalid();
            literal(static_cast<unsigned char>(p[i++]));
            continue;
        }
        switch (c) {
            case '*':
                // A run of stars is one star.
                if (tokens.empty() || tokens.back().kind != Token::Star)
                    tokens.emplace_back(Token::Star);
                break;
            case '?':
                tokens.emplace_back(Token::Any);
                break;
            case '#':
                tokens.emplace_back(Token::Digit);
                break;
            case '[': {
                Token set(Token::Set);
                if (i < p.size() && p[i] == '!') {
                    set.negate = true;
                    ++i;
                }
                bool closed = false;
                bool any = false;
                while (i < p.size()) {
                    char item = p[i++];
                    if (item == ']') {
                        closed = true;
                        break;
                    }
                    if (escape && item == *escape) {
                        if (i == p.size()) Invalid();
                        item = p[i++];
                    }
                    const auto lo = static_cast<unsigned char>(item);
                    unsigned char hi = lo;
                    // "a-z" is a range; a '-' first or last in the list is itself.
                    if (i + 1 < p.size() && p[i] == '-' && p[i + 1] != ']') {
                        char end = p[i + 1];
                        i += 2;
                        if (escape && end == *escape) {
                            if (i == p.size()) Invalid();
                            end = p[i++];
                        }
                        hi = static_cast<unsigned char>(end);
                        if (hi < lo) Invalid();
                    }
                    set.ranges.push_back({lo, hi});
                    any = true;
                }
                if (!closed) Invalid();
                // [] takes no character at all; [!] is any one character.
                if (any || set.negate) tokens.push_back(std::move(set));
                break;
            }
            default:
                literal(static_cast<unsigned char>(c));
                break;
        }
    }
    return tokens;
}

}  // namespace

bool JetLike(std::string_view text, std::string_view pattern, std::optional<char> escape) {
    const std::vector<Token> tokens = Compile(pattern, escape);
    // Every token but the star takes exactly one character, so the classic scan that backs up
    // to the last star is exact and linear in practice.
    size_t t = 0, k = 0;
    size_t starToken = SIZE_MAX, starText = 0;
    while (t < text.size()) {
        const auto c = static_cast<unsigned char>(text[t]);
        if (k < tokens.size() && tokens[k].kind == Token::Star) {
            starToken = k++;
            starText = t;
        } else if (k < tokens.size() && tokens[k].matches(c)) {
            ++k;
            ++t;
        } else if (starToken != SIZE_MAX) {
            k = starToken + 1;
            t = ++starText;
        } else {
            return false;
        }
    }
    while (k < tokens.size() && tokens[k].kind == Token::Star) ++k;
    return k == tokens.size();
}

}  // namespace maroset::platform
