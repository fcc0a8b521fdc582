// A line of `maroset run` is whatever a script or a person types: words, quotes that never
// close, escapes at the end of the line, numbers too large for any type. Splitting it either
// gives words or a BadCommand, always ends, and every value is a Variant the host can take.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "cli/BadCommand.h"
#include "cli/CommandTokenizer.h"
#include "lang/VbError.h"

using maroset::cli::BadCommand;
using maroset::cli::CommandTokenizer;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string_view line(reinterpret_cast<const char*>(data), size);
    // The first byte chooses after how many words the rest of the line is taken as it stands
    // (as `add NODE HANDLE ADDRESS` does).
    const size_t restAfter = size > 0 ? data[0] % 4 : 0;
    CommandTokenizer words(line);
    try {
        for (size_t taken = 0;; ++taken) {
            if (taken > size) std::abort();  // every word takes at least one byte
            if (taken == restAfter) {
                const std::string rest = words.rest();
                if (rest.size() > size || line.find(rest) == std::string_view::npos) std::abort();
            }
            const auto word = words.next();
            if (!word) break;
            if (!word->quoted && (word->text.empty() ||
                                  word->text.find_first_of(" \t") != std::string::npos))
                std::abort();  // an unquoted word is never empty and never holds a blank
            try {
                const auto value = CommandTokenizer::ParseValue(*word);
                if (word->quoted && !value.isString()) std::abort();
            } catch (const maroset::VbError&) {
                // A number too large for a Double: Overflow, as the command answers it.
            }
        }
        if (!words.atEnd()) std::abort();
    } catch (const BadCommand&) {
        // Malformed quoting.
    }
    return 0;
}
