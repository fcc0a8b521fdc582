#include "platform/LinkTrace.h"

namespace maroset::platform {

namespace {
constexpr char kHexDigits[] = "0123456789ABCDEF";
}

void LinkTrace::write(std::string_view source, std::string_view text) const {
    if (!sink_) return;
    std::string line;
    line.reserve(source.size() + 2 + text.size());
    line.append(source).append(": ").append(text);
    sink_(line);
}

std::string LinkTrace::Hex(std::string_view bytes) {
    std::string out;
    out.reserve(bytes.size() * 3);
    for (const char c : bytes) {
        const auto b = static_cast<unsigned char>(c);
        if (!out.empty()) out += ' ';
        out += kHexDigits[b >> 4];
        out += kHexDigits[b & 0x0F];
    }
    return out;
}

std::string LinkTrace::Printable(std::string_view text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        const auto b = static_cast<unsigned char>(c);
        if (b == '\r') {
            out += "<CR>";
        } else if (b == '\n') {
            out += "<LF>";
        } else if (b < 0x20 || b >= 0x7F) {
            out += "<0x";
            out += kHexDigits[b >> 4];
            out += kHexDigits[b & 0x0F];
            out += '>';
        } else {
            out += c;
        }
    }
    return out;
}

}  // namespace maroset::platform
