#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

namespace maroset::fuzz {

// Reads a fuzzer's input front to back; past its end every read gives zeros or nothing, so a
// harness never has to check lengths itself.
struct FuzzInput {
    const uint8_t* data;
    size_t size;
    size_t at = 0;

    bool more() const { return at < size; }
    uint8_t byte() { return at < size ? data[at++] : 0; }
    std::string bytes(size_t n) {
        n = std::min(n, size - at);
        std::string out(reinterpret_cast<const char*>(data + at), n);
        at += n;
        return out;
    }
    template <class T>
    T number() {
        T v{};
        const size_t n = std::min(sizeof v, size - at);
        std::memcpy(&v, data + at, n);
        at += n;
        return v;
    }
};

}  // namespace maroset::fuzz
