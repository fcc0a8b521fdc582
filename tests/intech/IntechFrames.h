#pragma once

#include <cstdio>
#include <string>
#include <string_view>

namespace maroset::test {

// A reply as an instrument sends it: the body ("@" up to and including ":") followed by the
// sum of its characters after the "@", AND 255, as two uppercase hexadecimal digits.
inline std::string WithBcc(std::string_view body) {
    unsigned sum = 0;
    for (size_t i = 1; i < body.size(); ++i) sum += static_cast<unsigned char>(body[i]);
    char bcc[3];
    std::snprintf(bcc, sizeof bcc, "%02X", sum & 255);
    return std::string(body) + bcc;
}

}  // namespace maroset::test
