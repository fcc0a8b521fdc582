// The like matcher sees tag names and patterns that hosts and project files supply.
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "lang/VbError.h"
#include "platform/JetLike.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    const size_t split = input.find('\0');
    const std::string_view pattern = input.substr(0, split);
    const std::string_view text = split == std::string_view::npos ? "" : input.substr(split + 1);
    try {
        maroset::platform::JetLike(text, pattern);
        maroset::platform::JetLike(text, pattern, '\\');
    } catch (const maroset::VbError&) {
        // A malformed pattern is a clear error, never a crash.
    }
    return 0;
}
