#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "lang/Variant.h"
#include "platform/opcua/UaBinary.h"

namespace maroset::platform::opcua {

// A value with its UA data type, as a Variant or DataValue carries it. The value is the
// language's kind the type maps to: Boolean; SByte, Byte, Int16 as Integer; UInt16, Int32
// as Long; Float as Single; Double; UInt32, Int64, UInt64 as Double; String and
// LocalizedText (its text) as String, bytes unchanged; DateTime as Date; arrays as arrays of
// these (lower bound 0). Types with no such kind (Guid, NodeId, ...) keep their type and
// read as Empty.
struct DataValue {
    Variant value;
    BuiltIn type = BuiltIn::Null;
    bool array = false;
    uint32_t status = 0;
    int64_t sourceTime = 0;  // ticks, 0 when absent
    int64_t serverTime = 0;
};

struct StructType;

// One member of a structured type: a built-in type or a structure, alone or as an array.
// Enumerations are encoded as Int32.
struct Field {
    BuiltIn type = BuiltIn::Null;
    bool array = false;
    const StructType* inner = nullptr;  // for a structure (type Null)
};

// A structured type as data: its members in order, and the id of its binary encoding when
// it travels as a message body or in an ExtensionObject (0 for a member-only structure).
struct StructType {
    const char* name;
    uint32_t encodingId;
    std::span<const Field> fields;
};

// One leaf of a structure walked in order (depth first): an array contributes one entry
// with its length (isLength) followed by its elements. What a field does not need is left
// as it was.
struct Value {
    BuiltIn type = BuiltIn::Null;
    bool isLength = false;
    bool null = false;      // encode a null String/ByteString
    uint32_t count = 0;     // array length
    uint64_t number = 0;    // Boolean, the integers, StatusCode, DateTime ticks
    double real = 0;        // Float, Double
    std::string_view text;  // String, ByteString, LocalizedText's text, QualifiedName's
                            // name, ExtensionObject's body
    NodeId node;            // NodeId, ExpandedNodeId, ExtensionObject's type
    DataValue data;         // Variant and DataValue
};

// Appending a request's values in walk order.
inline Value& AddValue(std::vector<Value>& v) {
    return v.emplace_back();
}
inline void AddNumber(std::vector<Value>& v, uint64_t n) {
    v.emplace_back().number = n;
}
inline void AddText(std::vector<Value>& v, std::string_view t) {
    v.emplace_back().text = t;
}
inline void AddNull(std::vector<Value>& v) {
    v.emplace_back().null = true;
}
inline void AddLength(std::vector<Value>& v, uint32_t n) {
    Value& l = v.emplace_back();
    l.isLength = true;
    l.count = n;
}

// Encodes `type` from values given in walk order; fails (std::logic_error) when the values
// do not follow the description, which is a fault of the caller.
void Encode(Writer& w, const StructType& type, std::span<const Value> values);
// Decodes `type` into values (cleared first, its capacity kept for the next message).
// Strings in the values point into the message. Throws DecodeError.
void Decode(Reader& r, const StructType& type, std::vector<Value>& values);

// One Variant (the encoding byte first) into a DataValue's value and type. A matrix reads
// as its elements in order.
void DecodeVariant(Reader& r, DataValue& out);
// A DataValue (its encoding mask first).
void DecodeDataValue(Reader& r, DataValue& out);
// A value as a Variant of the given type (an array when value is one); the value must
// already hold the type's kind (see ConvertForType).
void EncodeVariant(Writer& w, const Variant& value, BuiltIn type);
// Converts a host value to what `type` needs, as the language's conversions do: false when
// it does not convert (range is then true when it was out of the type's range).
bool ConvertForType(const Variant& in, BuiltIn type, Variant& out, bool& range);

}  // namespace maroset::platform::opcua
