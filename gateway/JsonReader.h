#pragma once

#include <cstddef>
#include <stdexcept>
#include <string>
#include <string_view>

#include "gateway/JsonValue.h"

namespace maroset::gateway {

// Reads one JSON text (RFC 8259) from a client. The text is hostile input: its size and
// nesting are bounded, every read is checked against the end, and anything malformed is a
// JsonReader::Error saying what and where, never a crash.
//
// Strings are UTF-8 on the wire and Latin-1 bytes in the library: a character above U+00FF
// cannot be held and is an error, as is malformed UTF-8.
class JsonReader {
  public:
    struct Error : std::runtime_error {
        using std::runtime_error::runtime_error;
    };

    static constexpr size_t MaxSize = 64 * 1024;
    static constexpr int MaxDepth = 32;

    static JsonValue Parse(std::string_view text);

  private:
    explicit JsonReader(std::string_view text) : text_(text) {}

    JsonValue value(int depth);
    JsonValue object(int depth);
    JsonValue array(int depth);
    std::string string();
    JsonValue number();
    void literal(std::string_view word);
    uint32_t hex4();
    void skipBlanks();
    char peek() const { return pos_ < text_.size() ? text_[pos_] : '\0'; }
    bool atEnd() const { return pos_ >= text_.size(); }
    [[noreturn]] void fail(const std::string& what) const;

    std::string_view text_;
    size_t pos_ = 0;
};

}  // namespace maroset::gateway
