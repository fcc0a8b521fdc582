#include "platform/opcua/UaBinary.h"

#include <bit>
#include <charconv>
#include <cmath>

namespace maroset::platform::opcua {

static_assert(std::endian::native == std::endian::little,
              "the UA binary encoding is copied as is: a little-endian host is assumed");

namespace {

// Nested DiagnosticInfos a hostile peer could stack without end.
constexpr int MaxDiagnosticDepth = 8;

// Ticks (100 ns) from 1601-01-01 to 1899-12-30, and per day.
constexpr int64_t TicksAtDateZero = 109205LL * 864000000000LL;
constexpr double TicksPerDay = 864000000000.0;
// Ticks from 1601-01-01 to 1970-01-01.
constexpr int64_t TicksAtUnixEpoch = 116444736000000000LL;

bool parseUnsigned(std::string_view text, uint64_t max, uint64_t& out) {
    if (text.empty()) return false;
    const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), out);
    return ec == std::errc() && end == text.data() + text.size() && out <= max;
}

int hexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return -1;
}

// "72962B91-FA75-4AE6-8D28-B404DC7DAF63": Data1..3 go little-endian, Data4 as written.
bool parseGuid(std::string_view t, std::array<uint8_t, 16>& g) {
    if (t.size() == 38 && t.front() == '{' && t.back() == '}') t = t.substr(1, 36);
    if (t.size() != 36 || t[8] != '-' || t[13] != '-' || t[18] != '-' || t[23] != '-') return false;
    uint8_t raw[16];
    size_t n = 0;
    for (size_t i = 0; i < t.size(); ++i) {
        if (i == 8 || i == 13 || i == 18 || i == 23) continue;
        const int hi = hexDigit(t[i]);
        const int lo = hexDigit(t[++i]);
        if (hi < 0 || lo < 0) return false;
        raw[n++] = static_cast<uint8_t>(hi * 16 + lo);
    }
    const uint8_t order[16] = {3, 2, 1, 0, 5, 4, 7, 6, 8, 9, 10, 11, 12, 13, 14, 15};
    for (size_t i = 0; i < 16; ++i) g[i] = raw[order[i]];
    return true;
}

std::string guidText(const std::array<uint8_t, 16>& g) {
    const uint8_t order[16] = {3, 2, 1, 0, 5, 4, 7, 6, 8, 9, 10, 11, 12, 13, 14, 15};
    static constexpr char digits[] = "0123456789ABCDEF";
    std::string s;
    for (size_t i = 0; i < 16; ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10) s.push_back('-');
        const uint8_t b = g[order[i]];
        s.push_back(digits[b >> 4]);
        s.push_back(digits[b & 15]);
    }
    return s;
}

int base64Digit(char c) {
    if (c >= 'A' && c <= 'Z') return c - 'A';
    if (c >= 'a' && c <= 'z') return c - 'a' + 26;
    if (c >= '0' && c <= '9') return c - '0' + 52;
    if (c == '+') return 62;
    if (c == '/') return 63;
    return -1;
}

bool parseBase64(std::string_view t, std::string& out) {
    out.clear();
    while (!t.empty() && t.back() == '=') t.remove_suffix(1);
    uint32_t acc = 0;
    int bits = 0;
    for (char c : t) {
        const int d = base64Digit(c);
        if (d < 0) return false;
        acc = (acc << 6) | static_cast<uint32_t>(d);
        bits += 6;
        if (bits >= 8) {
            bits -= 8;
            out.push_back(static_cast<char>((acc >> bits) & 0xFF));
        }
    }
    return bits < 6;  // a lone sixth of a byte is no encoding of anything
}

std::string base64Text(std::string_view bytes) {
    static constexpr char digits[] =
        "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string s;
    uint32_t acc = 0;
    int bits = 0;
    for (char c : bytes) {
        acc = (acc << 8) | static_cast<uint8_t>(c);
        bits += 8;
        while (bits >= 6) {
            bits -= 6;
            s.push_back(digits[(acc >> bits) & 63]);
        }
    }
    if (bits > 0) s.push_back(digits[(acc << (6 - bits)) & 63]);
    while (s.size() % 4) s.push_back('=');
    return s;
}

// The identifier part: "i=..", "s=..", "g=..", "b=..".
bool parseIdentifier(std::string_view t, NodeId& id) {
    if (t.size() < 2 || t[1] != '=') return false;
    const std::string_view v = t.substr(2);
    switch (t[0]) {
        case 'i': {
            uint64_t n = 0;
            if (!parseUnsigned(v, UINT32_MAX, n)) return false;
            id.kind = NodeId::Kind::Numeric;
            id.numeric = static_cast<uint32_t>(n);
            return true;
        }
        case 's':
            if (v.empty()) return false;
            id.kind = NodeId::Kind::String;
            id.text = std::string(v);
            return true;
        case 'g':
            id.kind = NodeId::Kind::Guid;
            return parseGuid(v, id.guid);
        case 'b':
            id.kind = NodeId::Kind::Opaque;
            return !v.empty() && parseBase64(v, id.text);
        default:
            return false;
    }
}

}  // namespace

bool ParseNodeId(std::string_view text, NodeId& id) {
    id = NodeId{};
    if (text.starts_with("ns=")) {
        const size_t semi = text.find(';');
        if (semi == std::string_view::npos) return false;
        uint64_t ns = 0;
        if (!parseUnsigned(text.substr(3, semi - 3), UINT16_MAX, ns)) return false;
        id.ns = static_cast<uint16_t>(ns);
        return parseIdentifier(text.substr(semi + 1), id);
    }
    if (text.starts_with("nsu=")) {
        // The URI may hold ';' itself: the identifier starts at the last ";X=".
        for (size_t semi = text.rfind(';'); semi != std::string_view::npos && semi > 4;
             semi = text.rfind(';', semi - 1)) {
            const std::string_view rest = text.substr(semi + 1);
            if (rest.size() >= 2 && rest[1] == '=') {
                id.namespaceUri = std::string(text.substr(4, semi - 4));
                return parseIdentifier(rest, id);
            }
        }
        return false;
    }
    return parseIdentifier(text, id);
}

std::string NodeIdText(const NodeId& id) {
    std::string s;
    if (!id.namespaceUri.empty()) {
        s = "nsu=" + id.namespaceUri + ";";
    } else if (id.ns != 0) {
        s = "ns=" + std::to_string(id.ns) + ";";
    }
    switch (id.kind) {
        case NodeId::Kind::Numeric:
            return s + "i=" + std::to_string(id.numeric);
        case NodeId::Kind::String:
            return s + "s=" + id.text;
        case NodeId::Kind::Guid:
            return s + "g=" + guidText(id.guid);
        case NodeId::Kind::Opaque:
            return s + "b=" + base64Text(id.text);
    }
    return s;
}

float Reader::f32() {
    const uint32_t bits = u32();
    return std::bit_cast<float>(bits);
}

double Reader::f64() {
    const uint64_t bits = u64();
    return std::bit_cast<double>(bits);
}

std::string_view Reader::bytes() {
    const int32_t n = i32();
    if (n <= 0) return {};  // -1 is null, and any other negative length is read as null too
    return take(static_cast<size_t>(n));
}

uint32_t Reader::arrayLength(size_t minElementSize) {
    const int32_t n = i32();
    if (n <= 0) return 0;
    if (static_cast<size_t>(n) > left() / (minElementSize ? minElementSize : 1))
        throw DecodeError("array longer than its message");
    return static_cast<uint32_t>(n);
}

void Reader::nodeId(NodeId& id) {
    const uint8_t form = u8();
    // Flags belong to the expanded form only.
    if (form & 0xC0) throw DecodeError("expanded node id flags in a node id");
    identifier(form, id);
}

void Reader::expandedNodeId(NodeId& id) {
    const uint8_t form = u8();
    identifier(form & 0x3F, id);
    if (form & 0x80) id.namespaceUri = std::string(bytes());
    if (form & 0x40) (void)u32();  // server index: one server is all this client talks to
}

void Reader::identifier(uint8_t form, NodeId& id) {
    id.namespaceUri.clear();
    switch (form) {
        case 0:
            id.ns = 0;
            id.kind = NodeId::Kind::Numeric;
            id.numeric = u8();
            return;
        case 1:
            id.ns = u8();
            id.kind = NodeId::Kind::Numeric;
            id.numeric = u16();
            return;
        case 2:
            id.ns = u16();
            id.kind = NodeId::Kind::Numeric;
            id.numeric = u32();
            return;
        case 3:
            id.ns = u16();
            id.kind = NodeId::Kind::String;
            id.text = std::string(bytes());
            return;
        case 4: {
            id.ns = u16();
            id.kind = NodeId::Kind::Guid;
            const std::string_view g = take(16);
            std::memcpy(id.guid.data(), g.data(), 16);
            return;
        }
        case 5:
            id.ns = u16();
            id.kind = NodeId::Kind::Opaque;
            id.text = std::string(bytes());
            return;
        default:
            throw DecodeError("unknown node id encoding");
    }
}

void Reader::skipDiagnosticInfo(int depth) {
    if (depth > MaxDiagnosticDepth) throw DecodeError("diagnostic info nested too deep");
    const uint8_t mask = u8();
    if (mask & 0x01) skip(4);
    if (mask & 0x02) skip(4);
    if (mask & 0x04) skip(4);
    if (mask & 0x08) skip(4);
    if (mask & 0x10) (void)bytes();
    if (mask & 0x20) skip(4);
    if (mask & 0x40) skipDiagnosticInfo(depth + 1);
}

void Writer::bytes(std::string_view v, bool isNull) {
    if (isNull) {
        i32(-1);
        return;
    }
    i32(static_cast<int32_t>(v.size()));
    out_.append(v);
}

void Writer::nodeId(const NodeId& id) {
    switch (id.kind) {
        case NodeId::Kind::Numeric:
            if (id.ns == 0 && id.numeric <= 0xFF) {
                u8(0);
                u8(static_cast<uint8_t>(id.numeric));
            } else if (id.ns <= 0xFF && id.numeric <= 0xFFFF) {
                u8(1);
                u8(static_cast<uint8_t>(id.ns));
                u16(static_cast<uint16_t>(id.numeric));
            } else {
                u8(2);
                u16(id.ns);
                u32(id.numeric);
            }
            return;
        case NodeId::Kind::String:
            u8(3);
            u16(id.ns);
            bytes(id.text);
            return;
        case NodeId::Kind::Guid:
            u8(4);
            u16(id.ns);
            out_.append(reinterpret_cast<const char*>(id.guid.data()), 16);
            return;
        case NodeId::Kind::Opaque:
            u8(5);
            u16(id.ns);
            bytes(id.text);
            return;
    }
}

double DateFromTicks(int64_t ticks) {
    if (ticks == 0) return 0.0;
    // Whatever a server sends: the difference is taken where it cannot overflow.
    if (ticks < INT64_MIN + TicksAtDateZero)
        return (static_cast<double>(ticks) - static_cast<double>(TicksAtDateZero)) / TicksPerDay;
    return static_cast<double>(ticks - TicksAtDateZero) / TicksPerDay;
}

int64_t TicksFromDate(double date) {
    const double ticks = std::round(date * TicksPerDay) + static_cast<double>(TicksAtDateZero);
    if (!(ticks > 0)) return 0;
    if (ticks >= 9.2e18) return INT64_MAX;
    return static_cast<int64_t>(ticks);
}

int64_t TicksFromUnixMs(int64_t ms) {
    return ms * 10000 + TicksAtUnixEpoch;
}

}  // namespace maroset::platform::opcua
