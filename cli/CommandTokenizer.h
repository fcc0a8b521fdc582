#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "lang/Variant.h"

namespace maroset::cli {

// Splits one command line of `maroset run` into words separated by blanks (spaces or tabs).
// A word that starts with a double quote runs to the closing quote and may hold blanks; inside
// it \" is a quote and \\ a backslash. Text is bytes: nothing is decoded. Malformed quoting is
// a BadCommand.
class CommandTokenizer {
  public:
    struct Word {
        std::string text;
        bool quoted = false;
    };

    explicit CommandTokenizer(std::string_view line) : line_(line) {}

    // The next word, or nothing at the end of the line.
    std::optional<Word> next();
    // Everything after the blanks that follow the last word taken, as it stands.
    std::string rest();
    bool atEnd();

    // A command's VALUE: an integer (Long, or Double beyond 32 bits), a decimal number (Double),
    // true or false in any letter case (Boolean), else text. A quoted word is always text. A
    // number too large for a Double fails with Overflow (6).
    static Variant ParseValue(const Word& word);

  private:
    void skipBlanks();

    std::string_view line_;
    size_t pos_ = 0;
};

}  // namespace maroset::cli
