#include "gateway/JsonReader.h"

#include <charconv>
#include <cmath>
#include <cstdint>

namespace maroset::gateway {

JsonValue JsonReader::Parse(std::string_view text) {
    if (text.size() > MaxSize) throw Error("JSON text longer than 65536 bytes");
    JsonReader reader(text);
    reader.skipBlanks();
    JsonValue v = reader.value(0);
    reader.skipBlanks();
    if (!reader.atEnd()) reader.fail("unexpected text after the value");
    return v;
}

void JsonReader::fail(const std::string& what) const {
    throw Error(what + " at byte " + std::to_string(pos_));
}

void JsonReader::skipBlanks() {
    while (!atEnd() && (peek() == ' ' || peek() == '\t' || peek() == '\n' || peek() == '\r'))
        ++pos_;
}

JsonValue JsonReader::value(int depth) {
    if ((peek() == '{' || peek() == '[') && depth >= MaxDepth) fail("JSON nested too deeply");
    switch (peek()) {
        case '{':
            return object(depth + 1);
        case '[':
            return array(depth + 1);
        case '"': {
            JsonValue v;
            v.kind = JsonValue::Kind::String;
            v.text = string();
            return v;
        }
        case 't': {
            literal("true");
            JsonValue v;
            v.kind = JsonValue::Kind::Boolean;
            v.boolean = true;
            return v;
        }
        case 'f': {
            literal("false");
            JsonValue v;
            v.kind = JsonValue::Kind::Boolean;
            return v;
        }
        case 'n':
            literal("null");
            return {};
        default:
            if (peek() == '-' || (peek() >= '0' && peek() <= '9')) return number();
            fail(atEnd() ? "JSON text ends early" : "unexpected character");
    }
}

JsonValue JsonReader::object(int depth) {
    JsonValue v;
    v.kind = JsonValue::Kind::Object;
    ++pos_;  // {
    skipBlanks();
    if (peek() == '}') {
        ++pos_;
        return v;
    }
    for (;;) {
        skipBlanks();
        if (peek() != '"') fail("expected a member name");
        std::string name = string();
        skipBlanks();
        if (peek() != ':') fail("expected ':'");
        ++pos_;
        skipBlanks();
        v.values.push_back(value(depth));
        v.names.push_back(std::move(name));
        skipBlanks();
        if (peek() == ',') {
            ++pos_;
            continue;
        }
        if (peek() == '}') {
            ++pos_;
            return v;
        }
        fail("expected ',' or '}'");
    }
}

JsonValue JsonReader::array(int depth) {
    JsonValue v;
    v.kind = JsonValue::Kind::Array;
    ++pos_;  // [
    skipBlanks();
    if (peek() == ']') {
        ++pos_;
        return v;
    }
    for (;;) {
        skipBlanks();
        v.items.push_back(value(depth));
        skipBlanks();
        if (peek() == ',') {
            ++pos_;
            continue;
        }
        if (peek() == ']') {
            ++pos_;
            return v;
        }
        fail("expected ',' or ']'");
    }
}

void JsonReader::literal(std::string_view word) {
    if (text_.substr(pos_, word.size()) != word) fail("unexpected character");
    pos_ += word.size();
}

uint32_t JsonReader::hex4() {
    if (text_.size() - pos_ < 4) fail("JSON text ends early");
    uint32_t code = 0;
    for (int i = 0; i < 4; ++i) {
        const char c = text_[pos_++];
        code <<= 4;
        if (c >= '0' && c <= '9')
            code |= static_cast<uint32_t>(c - '0');
        else if (c >= 'a' && c <= 'f')
            code |= static_cast<uint32_t>(c - 'a' + 10);
        else if (c >= 'A' && c <= 'F')
            code |= static_cast<uint32_t>(c - 'A' + 10);
        else
            fail("bad \\u escape");
    }
    return code;
}

std::string JsonReader::string() {
    ++pos_;  // "
    std::string out;
    auto put = [&](uint32_t code) {
        if (code > 0xFF) fail("character beyond Latin-1 in a string");
        out += static_cast<char>(code);
    };
    for (;;) {
        if (atEnd()) fail("unterminated string");
        const auto c = static_cast<unsigned char>(text_[pos_++]);
        if (c == '"') return out;
        if (c < 0x20) fail("control character in a string");
        if (c == '\\') {
            if (atEnd()) fail("unterminated string");
            const char e = text_[pos_++];
            switch (e) {
                case '"':
                case '\\':
                case '/':
                    out += e;
                    break;
                case 'b':
                    out += '\b';
                    break;
                case 'f':
                    out += '\f';
                    break;
                case 'n':
                    out += '\n';
                    break;
                case 'r':
                    out += '\r';
                    break;
                case 't':
                    out += '\t';
                    break;
                // A surrogate is always beyond Latin-1, so put() refuses it.
                case 'u':
                    put(hex4());
                    break;
                default:
                    fail("bad escape in a string");
            }
            continue;
        }
        if (c < 0x80) {
            out += static_cast<char>(c);
            continue;
        }
        // Two-byte UTF-8 covers U+0080..U+07FF; only C2 and C3 lead bytes stay within Latin-1.
        if ((c & 0xE0) == 0xC0 && c >= 0xC2) {
            if (atEnd()) fail("malformed UTF-8");
            const auto c2 = static_cast<unsigned char>(text_[pos_++]);
            if ((c2 & 0xC0) != 0x80) fail("malformed UTF-8");
            put(((c & 0x1Fu) << 6) | (c2 & 0x3Fu));
            continue;
        }
        fail((c & 0xC0) == 0x80 || c < 0xC2 ? "malformed UTF-8"
                                            : "character beyond Latin-1 in a string");
    }
}

JsonValue JsonReader::number() {
    const size_t start = pos_;
    bool integral = true;
    if (peek() == '-') ++pos_;
    if (peek() == '0') {
        ++pos_;
    } else if (peek() >= '1' && peek() <= '9') {
        while (peek() >= '0' && peek() <= '9') ++pos_;
    } else {
        fail("malformed number");
    }
    if (peek() == '.') {
        integral = false;
        ++pos_;
        if (!(peek() >= '0' && peek() <= '9')) fail("malformed number");
        while (peek() >= '0' && peek() <= '9') ++pos_;
    }
    if (peek() == 'e' || peek() == 'E') {
        integral = false;
        ++pos_;
        if (peek() == '+' || peek() == '-') ++pos_;
        if (!(peek() >= '0' && peek() <= '9')) fail("malformed number");
        while (peek() >= '0' && peek() <= '9') ++pos_;
    }
    JsonValue v;
    v.kind = JsonValue::Kind::Number;
    const auto [end, ec] = std::from_chars(text_.data() + start, text_.data() + pos_, v.number);
    if (ec != std::errc() || end != text_.data() + pos_ || !std::isfinite(v.number))
        fail("number out of range");
    v.integral = integral && v.number >= INT32_MIN && v.number <= INT32_MAX;
    return v;
}

}  // namespace maroset::gateway
