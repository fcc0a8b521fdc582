#include "platform/LinkText.h"

namespace maroset::platform {

namespace {

constexpr char kHexDigits[] = "0123456789ABCDEF";

void appendHex(std::string& out, std::string_view bytes) {
    for (const char c : bytes) {
        const auto b = static_cast<unsigned char>(c);
        if (!out.empty() && out.back() != ' ') out += ' ';
        out += kHexDigits[b >> 4];
        out += kHexDigits[b & 0x0F];
    }
}

void appendPrintable(std::string& out, std::string_view text) {
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
}

template <class Append>
std::string dump(std::string_view bytes, Append append, size_t perByte) {
    std::string out;
    if (bytes.size() <= DumpWhole) {
        out.reserve(bytes.size() * perByte);
        append(out, bytes);
        return out;
    }
    out.reserve((DumpHead + DumpTail) * perByte + 40);
    append(out, bytes.substr(0, DumpHead));
    out += " ... " + std::to_string(bytes.size() - DumpHead - DumpTail) + " bytes left out ... ";
    append(out, bytes.substr(bytes.size() - DumpTail));
    return out;
}

}  // namespace

std::string Hex(std::string_view bytes) {
    return dump(bytes, appendHex, 3);
}

std::string Printable(std::string_view text) {
    return dump(text, appendPrintable, 1);
}

}  // namespace maroset::platform
