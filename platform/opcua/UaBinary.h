#pragma once

#include <array>
#include <cstdint>
#include <cstring>
#include <stdexcept>
#include <string>
#include <string_view>

#include "lang/Variant.h"

namespace maroset::platform::opcua {

// The built-in types of the OPC UA binary encoding, numbered as the Variant's encoding byte
// numbers them.
enum class BuiltIn : uint8_t {
    Null = 0,
    Boolean = 1,
    SByte = 2,
    Byte = 3,
    Int16 = 4,
    UInt16 = 5,
    Int32 = 6,
    UInt32 = 7,
    Int64 = 8,
    UInt64 = 9,
    Float = 10,
    Double = 11,
    String = 12,
    DateTime = 13,
    Guid = 14,
    ByteString = 15,
    XmlElement = 16,
    NodeId = 17,
    ExpandedNodeId = 18,
    StatusCode = 19,
    QualifiedName = 20,
    LocalizedText = 21,
    ExtensionObject = 22,
    DataValue = 23,
    Variant = 24,
    DiagnosticInfo = 25,
};
constexpr uint8_t LastBuiltIn = 25;

// A message that does not decode (too short, a length beyond what is left, a nesting too
// deep): the message is dropped and the connection with it.
class DecodeError : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

// A node id. The namespace URI of an expanded node id (and of the "nsu=" text form) is kept
// in namespaceUri until it is resolved against the server's namespace array.
struct NodeId {
    enum class Kind : uint8_t { Numeric, String, Guid, Opaque };
    uint16_t ns = 0;
    Kind kind = Kind::Numeric;
    uint32_t numeric = 0;
    std::string text;                // String and Opaque identifiers
    std::array<uint8_t, 16> guid{};  // as encoded: Data1..3 little-endian, then Data4
    std::string namespaceUri;

    static NodeId Numeric(uint32_t id, uint16_t ns = 0) {
        NodeId n;
        n.ns = ns;
        n.numeric = id;
        return n;
    }
    friend bool operator==(const NodeId&, const NodeId&) = default;
};

// Parses the standard text forms "ns=N;s=TEXT", "ns=N;i=NUMBER", "i=NUMBER",
// "ns=N;g=GUID", "ns=N;b=BASE64" and "nsu=URI;s=TEXT" (any identifier kind after nsu=).
// False for anything else.
bool ParseNodeId(std::string_view text, NodeId& id);
// The text form of a node id ("ns=2;s=Line1.Level").
std::string NodeIdText(const NodeId& id);

// Reads the binary encoding from [position, end). Every read checks what is left first, so
// a reader never reads past end; lengths are checked against what is left before anything is
// allocated.
class Reader {
  public:
    Reader(const char* position, const char* end) : p_(position), end_(end) {}
    explicit Reader(std::string_view bytes) : p_(bytes.data()), end_(bytes.data() + bytes.size()) {}

    size_t left() const { return static_cast<size_t>(end_ - p_); }
    const char* position() const { return p_; }

    uint8_t u8() {
        need(1);
        return static_cast<uint8_t>(*p_++);
    }
    uint16_t u16() { return fixed<uint16_t>(); }
    uint32_t u32() { return fixed<uint32_t>(); }
    uint64_t u64() { return fixed<uint64_t>(); }
    int16_t i16() { return static_cast<int16_t>(u16()); }
    int32_t i32() { return static_cast<int32_t>(u32()); }
    int64_t i64() { return static_cast<int64_t>(u64()); }
    float f32();
    double f64();
    // A String or ByteString: null (length -1) reads as empty. The view points into the
    // message.
    std::string_view bytes();
    // An array length: -1 (null) reads as 0; a length that cannot fit in what is left (each
    // element takes at least minElementSize bytes) fails.
    uint32_t arrayLength(size_t minElementSize = 1);
    void skip(size_t n) {
        need(n);
        p_ += n;
    }
    std::string_view take(size_t n) {
        need(n);
        std::string_view v(p_, n);
        p_ += n;
        return v;
    }

    void nodeId(NodeId& id);
    void expandedNodeId(NodeId& id);
    // Skips a DiagnosticInfo (nested ones included, to a bounded depth).
    void skipDiagnosticInfo(int depth = 0);

  private:
    void identifier(uint8_t form, NodeId& id);
    void need(size_t n) const {
        if (static_cast<size_t>(end_ - p_) < n) throw DecodeError("message ends early");
    }
    template <class T>
    T fixed() {
        need(sizeof(T));
        T v;
        std::memcpy(&v, p_, sizeof(T));  // the encoding is little-endian, as this host is
        p_ += sizeof(T);
        return v;
    }

    const char* p_;
    const char* end_;
};

// Appends the binary encoding to a string (kept and reused by its owner).
class Writer {
  public:
    explicit Writer(std::string& out) : out_(out) {}

    std::string& out() { return out_; }
    void u8(uint8_t v) { out_.push_back(static_cast<char>(v)); }
    void u16(uint16_t v) { fixed(v); }
    void u32(uint32_t v) { fixed(v); }
    void u64(uint64_t v) { fixed(v); }
    void i32(int32_t v) { fixed(v); }
    void i64(int64_t v) { fixed(v); }
    void f32(float v) { fixed(v); }
    void f64(double v) { fixed(v); }
    // A String or ByteString; null when isNull.
    void bytes(std::string_view v, bool isNull = false);
    void nodeId(const NodeId& id);
    // Overwrites 4 bytes at offset (a size patched in once the message is complete).
    void patch32(size_t offset, uint32_t v) { std::memcpy(out_.data() + offset, &v, 4); }

  private:
    template <class T>
    void fixed(T v) {
        char b[sizeof(T)];
        std::memcpy(b, &v, sizeof(T));
        out_.append(b, sizeof(T));
    }
    std::string& out_;
};

// UA DateTime (100 ns ticks since 1601-01-01 UTC) and the language's Date (days since
// 1899-12-30 as a Double), both ways. Ticks 0 (no time) give Date 0.
double DateFromTicks(int64_t ticks);
int64_t TicksFromDate(double date);
// Milliseconds since the Unix epoch to ticks, for request headers.
int64_t TicksFromUnixMs(int64_t ms);

}  // namespace maroset::platform::opcua
