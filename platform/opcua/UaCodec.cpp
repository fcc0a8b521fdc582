#include "platform/opcua/UaCodec.h"

#include <cmath>
#include <stdexcept>

#include "lang/Conversions.h"
#include "lang/VbError.h"

namespace maroset::platform::opcua {

namespace {

// Structures nested in structures: the descriptions are ours, so this only guards against a
// description that refers to itself.
constexpr int MaxDepth = 16;

// The least number of bytes one element of a type takes, so that an array length can be
// checked against what is left before anything is allocated.
size_t minSize(const Field& f) {
    if (f.inner) return 1;
    switch (f.type) {
        case BuiltIn::Int16:
        case BuiltIn::UInt16:
            return 2;
        case BuiltIn::Int32:
        case BuiltIn::UInt32:
        case BuiltIn::Float:
        case BuiltIn::StatusCode:
        case BuiltIn::String:
        case BuiltIn::ByteString:
        case BuiltIn::XmlElement:
            return 4;
        case BuiltIn::Int64:
        case BuiltIn::UInt64:
        case BuiltIn::Double:
        case BuiltIn::DateTime:
            return 8;
        case BuiltIn::Guid:
            return 16;
        default:
            return 1;
    }
}

// ---- decoding ----

template <class T>
Variant arrayOf(uint32_t n, T&& element) {
    std::vector<Variant> items;
    items.reserve(n);
    for (uint32_t i = 0; i < n; ++i) items.push_back(element());
    return Variant(VbArray<Variant>(0, std::move(items)));
}

// One scalar of a Variant as the language's kind.
Variant scalar(Reader& r, BuiltIn t) {
    switch (t) {
        case BuiltIn::Boolean:
            return Variant(r.u8() != 0);
        case BuiltIn::SByte:
            return Variant(static_cast<int16_t>(static_cast<int8_t>(r.u8())));
        case BuiltIn::Byte:
            return Variant(static_cast<int16_t>(r.u8()));
        case BuiltIn::Int16:
            return Variant(r.i16());
        case BuiltIn::UInt16:
            return Variant(static_cast<int32_t>(r.u16()));
        case BuiltIn::Int32:
            return Variant(r.i32());
        case BuiltIn::UInt32:
            return Variant(static_cast<double>(r.u32()));
        case BuiltIn::Int64:
            return Variant(static_cast<double>(r.i64()));
        case BuiltIn::UInt64:
            return Variant(static_cast<double>(r.u64()));
        case BuiltIn::Float:
            return Variant(r.f32());
        case BuiltIn::Double:
            return Variant(r.f64());
        case BuiltIn::String:
            return Variant(std::string(r.bytes()));
        case BuiltIn::DateTime:
            return Variant::FromDate(DateFromTicks(r.i64()));
        case BuiltIn::LocalizedText: {
            const uint8_t mask = r.u8();
            if (mask & 0x01) (void)r.bytes();
            return Variant(std::string(mask & 0x02 ? r.bytes() : std::string_view()));
        }
        case BuiltIn::ByteString:
        case BuiltIn::XmlElement:
            (void)r.bytes();
            return Variant();
        case BuiltIn::Guid:
            r.skip(16);
            return Variant();
        case BuiltIn::StatusCode:
            (void)r.u32();
            return Variant();
        case BuiltIn::NodeId: {
            NodeId id;
            r.nodeId(id);
            return Variant();
        }
        case BuiltIn::ExpandedNodeId: {
            NodeId id;
            r.expandedNodeId(id);
            return Variant();
        }
        case BuiltIn::QualifiedName:
            (void)r.u16();
            (void)r.bytes();
            return Variant();
        case BuiltIn::ExtensionObject: {
            NodeId id;
            r.nodeId(id);
            const uint8_t encoding = r.u8();
            if (encoding != 0) (void)r.bytes();
            return Variant();
        }
        case BuiltIn::DiagnosticInfo:
            r.skipDiagnosticInfo();
            return Variant();
        case BuiltIn::DataValue:
        case BuiltIn::Variant:
        case BuiltIn::Null:
            break;
    }
    // A Variant or DataValue inside a Variant: only inside arrays of Variant, which this
    // client does not map; decoded to keep the position right, bounded by the caller.
    throw DecodeError("nested variant");
}

void readField(Reader& r, const Field& f, std::vector<Value>& out, int depth);

void readStruct(Reader& r, const StructType& type, std::vector<Value>& out, int depth) {
    if (depth > MaxDepth) throw DecodeError("structure nested too deep");
    for (const Field& f : type.fields) {
        if (!f.array) {
            readField(r, f, out, depth);
            continue;
        }
        const uint32_t n = r.arrayLength(minSize(f));
        Value& len = out.emplace_back();
        len.isLength = true;
        len.count = n;
        for (uint32_t i = 0; i < n; ++i) readField(r, f, out, depth);
    }
}

void readField(Reader& r, const Field& f, std::vector<Value>& out, int depth) {
    if (f.inner) {
        readStruct(r, *f.inner, out, depth + 1);
        return;
    }
    Value& v = out.emplace_back();
    v.type = f.type;
    switch (f.type) {
        case BuiltIn::Boolean:
        case BuiltIn::SByte:
        case BuiltIn::Byte:
            v.number = r.u8();
            break;
        case BuiltIn::Int16:
        case BuiltIn::UInt16:
            v.number = r.u16();
            break;
        case BuiltIn::Int32:
        case BuiltIn::UInt32:
        case BuiltIn::StatusCode:
            v.number = r.u32();
            break;
        case BuiltIn::Int64:
        case BuiltIn::UInt64:
        case BuiltIn::DateTime:
            v.number = r.u64();
            break;
        case BuiltIn::Float:
            v.real = r.f32();
            break;
        case BuiltIn::Double:
            v.real = r.f64();
            break;
        case BuiltIn::String:
        case BuiltIn::ByteString:
        case BuiltIn::XmlElement:
            v.text = r.bytes();
            break;
        case BuiltIn::Guid: {
            const std::string_view g = r.take(16);
            std::copy(g.begin(), g.end(), v.node.guid.begin());
            break;
        }
        case BuiltIn::NodeId:
            r.nodeId(v.node);
            break;
        case BuiltIn::ExpandedNodeId:
            r.expandedNodeId(v.node);
            break;
        case BuiltIn::QualifiedName:
            v.number = r.u16();
            v.text = r.bytes();
            break;
        case BuiltIn::LocalizedText: {
            const uint8_t mask = r.u8();
            if (mask & 0x01) (void)r.bytes();
            if (mask & 0x02) v.text = r.bytes();
            break;
        }
        case BuiltIn::ExtensionObject: {
            r.nodeId(v.node);
            const uint8_t encoding = r.u8();
            if (encoding != 0) v.text = r.bytes();
            v.number = encoding;
            break;
        }
        case BuiltIn::DataValue:
            DecodeDataValue(r, v.data);
            break;
        case BuiltIn::Variant:
            DecodeVariant(r, v.data);
            break;
        case BuiltIn::DiagnosticInfo:
            r.skipDiagnosticInfo();
            break;
        case BuiltIn::Null:
            break;
    }
}

// ---- encoding ----

[[noreturn]] void misuse(const char* what) {
    throw std::logic_error(std::string("UA encoding: ") + what);
}

void writeField(Writer& w, const Field& f, std::span<const Value> values, size_t& at);

void writeStruct(Writer& w, const StructType& type, std::span<const Value> values, size_t& at) {
    for (const Field& f : type.fields) {
        if (!f.array) {
            writeField(w, f, values, at);
            continue;
        }
        if (at >= values.size() || !values[at].isLength) misuse("array length expected");
        const Value& len = values[at++];
        if (len.null) {
            w.i32(-1);
            continue;
        }
        w.i32(static_cast<int32_t>(len.count));
        for (uint32_t i = 0; i < len.count; ++i) writeField(w, f, values, at);
    }
}

void writeField(Writer& w, const Field& f, std::span<const Value> values, size_t& at) {
    if (f.inner) {
        writeStruct(w, *f.inner, values, at);
        return;
    }
    if (at >= values.size() || values[at].isLength) misuse("value expected");
    const Value& v = values[at++];
    switch (f.type) {
        case BuiltIn::Boolean:
            w.u8(v.number ? 1 : 0);
            break;
        case BuiltIn::SByte:
        case BuiltIn::Byte:
            w.u8(static_cast<uint8_t>(v.number));
            break;
        case BuiltIn::Int16:
        case BuiltIn::UInt16:
            w.u16(static_cast<uint16_t>(v.number));
            break;
        case BuiltIn::Int32:
        case BuiltIn::UInt32:
        case BuiltIn::StatusCode:
            w.u32(static_cast<uint32_t>(v.number));
            break;
        case BuiltIn::Int64:
        case BuiltIn::UInt64:
        case BuiltIn::DateTime:
            w.u64(v.number);
            break;
        case BuiltIn::Float:
            w.f32(static_cast<float>(v.real));
            break;
        case BuiltIn::Double:
            w.f64(v.real);
            break;
        case BuiltIn::String:
        case BuiltIn::ByteString:
        case BuiltIn::XmlElement:
            w.bytes(v.text, v.null);
            break;
        case BuiltIn::Guid:
            w.out().append(reinterpret_cast<const char*>(v.node.guid.data()), 16);
            break;
        case BuiltIn::NodeId:
        case BuiltIn::ExpandedNodeId:
            w.nodeId(v.node);
            break;
        case BuiltIn::QualifiedName:
            w.u16(static_cast<uint16_t>(v.number));
            w.bytes(v.text, v.null);
            break;
        case BuiltIn::LocalizedText:
            if (v.text.empty()) {
                w.u8(0);
            } else {
                w.u8(0x02);
                w.bytes(v.text);
            }
            break;
        case BuiltIn::ExtensionObject:
            w.nodeId(v.node);
            if (v.number == 0) {
                w.u8(0);
            } else {
                w.u8(1);
                w.bytes(v.text);
            }
            break;
        case BuiltIn::DataValue:
            w.u8(0x01);  // the value alone: the server stamps its own times
            EncodeVariant(w, v.data.value, v.data.type);
            break;
        case BuiltIn::Variant:
            EncodeVariant(w, v.data.value, v.data.type);
            break;
        case BuiltIn::DiagnosticInfo:
            w.u8(0);
            break;
        case BuiltIn::Null:
            break;
    }
}

void writeScalar(Writer& w, const Variant& v, BuiltIn t) {
    switch (t) {
        case BuiltIn::Boolean:
            w.u8(v.boolean() ? 1 : 0);
            break;
        case BuiltIn::SByte:
        case BuiltIn::Byte:
            w.u8(static_cast<uint8_t>(v.integer()));
            break;
        case BuiltIn::Int16:
            w.u16(static_cast<uint16_t>(v.integer()));
            break;
        case BuiltIn::UInt16:
            w.u16(static_cast<uint16_t>(v.lng()));
            break;
        case BuiltIn::Int32:
            w.i32(v.lng());
            break;
        case BuiltIn::UInt32:
            w.u32(static_cast<uint32_t>(v.dbl()));
            break;
        case BuiltIn::Int64:
            w.i64(static_cast<int64_t>(v.dbl()));
            break;
        case BuiltIn::UInt64:
            w.u64(static_cast<uint64_t>(v.dbl()));
            break;
        case BuiltIn::Float:
            w.f32(v.single());
            break;
        case BuiltIn::Double:
            w.f64(v.dbl());
            break;
        case BuiltIn::String:
            w.bytes(v.string());
            break;
        case BuiltIn::LocalizedText:
            w.u8(0x02);
            w.bytes(v.string());
            break;
        case BuiltIn::DateTime:
            w.i64(TicksFromDate(v.date()));
            break;
        default:
            misuse("no language kind for this type");
    }
}

// Rounds to a whole number within [lo, hi]; false (range set) outside.
bool whole(const Variant& in, double lo, double hi, double& out, bool& range) {
    const double d = CDbl(in);
    if (!std::isfinite(d)) {
        range = true;
        return false;
    }
    const double r = std::nearbyint(d);
    if (r < lo || r > hi) {
        range = true;
        return false;
    }
    out = r;
    return true;
}

bool convertScalar(const Variant& in, BuiltIn type, Variant& out, bool& range) {
    if (in.isArray() || in.isObject() || in.isNull()) return false;
    double d = 0;
    switch (type) {
        case BuiltIn::Boolean:
            out = Variant(CBool(in));
            return true;
        case BuiltIn::SByte:
            if (!whole(in, -128, 127, d, range)) return false;
            out = Variant(static_cast<int16_t>(d));
            return true;
        case BuiltIn::Byte:
            if (!whole(in, 0, 255, d, range)) return false;
            out = Variant(static_cast<int16_t>(d));
            return true;
        case BuiltIn::Int16:
            out = Variant(CInt(in));
            return true;
        case BuiltIn::UInt16:
            if (!whole(in, 0, 65535, d, range)) return false;
            out = Variant(static_cast<int32_t>(d));
            return true;
        case BuiltIn::Int32:
            out = Variant(CLng(in));
            return true;
        case BuiltIn::UInt32:
            if (!whole(in, 0, 4294967295.0, d, range)) return false;
            out = Variant(d);
            return true;
        case BuiltIn::Int64:
            if (!whole(in, -9223372036854775808.0, 9223372036854774784.0, d, range)) return false;
            out = Variant(d);
            return true;
        case BuiltIn::UInt64:
            if (!whole(in, 0, 18446744073709549568.0, d, range)) return false;
            out = Variant(d);
            return true;
        case BuiltIn::Float:
            out = Variant(CSng(in));
            return true;
        case BuiltIn::Double:
            out = Variant(CDbl(in));
            return true;
        case BuiltIn::String:
        case BuiltIn::LocalizedText:
            out = Variant(CStr(in));
            return true;
        case BuiltIn::DateTime:
            out = Variant::FromDate(CDate(in));
            return true;
        default:
            return false;
    }
}

}  // namespace

void Encode(Writer& w, const StructType& type, std::span<const Value> values) {
    size_t at = 0;
    writeStruct(w, type, values, at);
    if (at != values.size()) misuse("more values than the description has fields");
}

void Decode(Reader& r, const StructType& type, std::vector<Value>& values) {
    values.clear();
    readStruct(r, type, values, 0);
}

void DecodeVariant(Reader& r, DataValue& out) {
    const uint8_t mask = r.u8();
    const uint8_t id = mask & 0x3F;
    if (id > LastBuiltIn) throw DecodeError("unknown variant type");
    const auto t = static_cast<BuiltIn>(id);
    out.type = t;
    out.array = (mask & 0x80) != 0;
    if (t == BuiltIn::Variant || t == BuiltIn::DataValue) {
        // A Variant of Variants is no type the host's items have.
        if (!out.array) throw DecodeError("variant holding a variant");
    }
    if (!out.array) {
        out.value = t == BuiltIn::Null ? Variant() : scalar(r, t);
        return;
    }
    const uint32_t n = r.arrayLength(minSize(Field{t}));
    if (t == BuiltIn::Variant || t == BuiltIn::DataValue) {
        // An array of Variants: each element is decoded, none nested deeper.
        out.value = arrayOf(n, [&r] {
            const uint8_t m = r.u8();
            const uint8_t eid = m & 0x3F;
            if ((m & 0xC0) || eid > LastBuiltIn || eid == 0 ||
                eid == static_cast<uint8_t>(BuiltIn::Variant) ||
                eid == static_cast<uint8_t>(BuiltIn::DataValue))
                throw DecodeError("nested variant");
            return scalar(r, static_cast<BuiltIn>(eid));
        });
    } else {
        out.value = arrayOf(n, [&r, t] { return scalar(r, t); });
    }
    if (mask & 0x40) {
        // Dimensions of a matrix: the elements were read in order, which is all the host gets.
        const uint32_t dims = r.arrayLength(4);
        r.skip(static_cast<size_t>(dims) * 4);
    }
}

void DecodeDataValue(Reader& r, DataValue& out) {
    const uint8_t mask = r.u8();
    if (mask & 0x01) {
        DecodeVariant(r, out);
    } else {
        out.value = Variant();
        out.type = BuiltIn::Null;
        out.array = false;
    }
    out.status = (mask & 0x02) ? r.u32() : 0;
    out.sourceTime = (mask & 0x04) ? r.i64() : 0;
    if (mask & 0x10) r.skip(2);
    out.serverTime = (mask & 0x08) ? r.i64() : 0;
    if (mask & 0x20) r.skip(2);
}

void EncodeVariant(Writer& w, const Variant& value, BuiltIn type) {
    if (type == BuiltIn::Null || value.isEmpty()) {
        w.u8(0);
        return;
    }
    if (!value.isArray()) {
        w.u8(static_cast<uint8_t>(type));
        writeScalar(w, value, type);
        return;
    }
    const auto& a = value.array();
    w.u8(static_cast<uint8_t>(static_cast<uint8_t>(type) | 0x80));
    w.i32(a.size());
    for (const Variant& e : a) writeScalar(w, e, type);
}

bool ConvertForType(const Variant& in, BuiltIn type, Variant& out, bool& range) {
    range = false;
    try {
        if (!in.isArray()) return convertScalar(in, type, out, range);
        const auto& a = in.array();
        std::vector<Variant> items(static_cast<size_t>(a.size()));
        size_t i = 0;
        for (const Variant& e : a) {
            if (!convertScalar(e, type, items[i++], range)) return false;
        }
        out = Variant(VbArray<Variant>(0, std::move(items)));
        return true;
    } catch (const VbError& e) {
        range = e.number() == err::Overflow;
        return false;
    }
}

}  // namespace maroset::platform::opcua
