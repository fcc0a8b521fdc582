#include "platform/opcua/UaCodec.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "lang/Conversions.h"
#include "platform/opcua/UaChunks.h"
#include "platform/opcua/UaServices.h"

// Byte vectors worked out by hand from the OPC UA binary encoding (OPC 10000-6, 5.2): every
// integer little-endian, strings as an Int32 length and the bytes, arrays as an Int32 count.

namespace maroset::platform::opcua {
namespace {

std::string bytes(std::initializer_list<int> b) {
    std::string s;
    for (int c : b) s.push_back(static_cast<char>(c));
    return s;
}

DataValue variantOf(const std::string& encoded) {
    Reader r(encoded);
    DataValue d;
    DecodeVariant(r, d);
    EXPECT_EQ(r.left(), 0u) << "the variant was not read to its end";
    return d;
}

// ---- built-in types inside a Variant ----

TEST(UaVariantDecoding, EachBuiltInTypeMapsToTheLanguagesKind) {
    EXPECT_EQ(variantOf(bytes({1, 1})).value, Variant(true));
    EXPECT_EQ(variantOf(bytes({2, 0xFB})).value, Variant(int16_t{-5}));
    EXPECT_EQ(variantOf(bytes({3, 0xC8})).value, Variant(int16_t{200}));
    EXPECT_EQ(variantOf(bytes({4, 0x2E, 0xFB})).value, Variant(int16_t{-1234}));
    EXPECT_EQ(variantOf(bytes({5, 0x60, 0xEA})).value, Variant(int32_t{60000}));
    EXPECT_EQ(variantOf(bytes({6, 0x60, 0x79, 0xFE, 0xFF})).value, Variant(int32_t{-100000}));
    EXPECT_EQ(variantOf(bytes({7, 0x00, 0x28, 0x6B, 0xEE})).value, Variant(4000000000.0));
    EXPECT_EQ(variantOf(bytes({8, 2, 0, 0, 0, 1, 0, 0, 0})).value, Variant(4294967298.0));
    EXPECT_EQ(variantOf(bytes({9, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF})).value,
              Variant(18446744073709551615.0));
    EXPECT_EQ(variantOf(bytes({10, 0, 0, 0xC0, 0x3F})).value, Variant(1.5f));
    EXPECT_EQ(variantOf(bytes({11, 0, 0, 0, 0, 0, 0, 0x0A, 0x40})).value, Variant(3.25));
    // UTF-8 bytes unchanged.
    EXPECT_EQ(variantOf(bytes({12, 3, 0, 0, 0, 'G', 0xC3, 0xBC})).value, Variant("G\xC3\xBC"));
    // A null string reads as empty.
    EXPECT_EQ(variantOf(bytes({12, 0xFF, 0xFF, 0xFF, 0xFF})).value, Variant(""));
    // LocalizedText: mask 3 = locale and text; the text is what the host gets.
    EXPECT_EQ(variantOf(bytes({21, 3, 2, 0, 0, 0, 'e', 'n', 2, 0, 0, 0, 'H', 'i'})).value,
              Variant("Hi"));
}

TEST(UaVariantDecoding, DateTimeBecomesTheLanguagesDate) {
    // 2024-01-02 03:04:05 UTC = 133486190450000000 ticks of 100 ns since 1601.
    const int64_t ticks = 133486382450000000LL;
    std::string b = bytes({13});
    for (int i = 0; i < 8; ++i) b.push_back(static_cast<char>((ticks >> (8 * i)) & 0xFF));
    const Variant v = variantOf(b).value;
    ASSERT_EQ(v.type(), VarType::Date);
    EXPECT_EQ(CStr(v), "1/2/2024 3:04:05 AM");
    EXPECT_EQ(TicksFromDate(v.date()), ticks);
    // No time at all is the Date zero, not 1601.
    EXPECT_EQ(DateFromTicks(0), 0.0);
}

TEST(UaVariantDecoding, ArraysAndMatricesBecomeZeroBasedArrays) {
    const DataValue d = variantOf(bytes({0x86, 2, 0, 0, 0, 1, 0, 0, 0, 0xFE, 0xFF, 0xFF, 0xFF}));
    EXPECT_TRUE(d.array);
    EXPECT_EQ(d.value, Variant(VbArray<Variant>(0, {Variant(1), Variant(-2)})));
    // A 2x1 matrix: the elements in order, the dimensions skipped.
    const DataValue m =
        variantOf(bytes({0xC3, 2, 0, 0, 0, 7, 8, 2, 0, 0, 0, 2, 0, 0, 0, 1, 0, 0, 0}));
    EXPECT_EQ(m.value, Variant(VbArray<Variant>(0, {Variant(int16_t{7}), Variant(int16_t{8})})));
}

TEST(UaVariantDecoding, LengthsBeyondTheMessageFailBeforeAnythingIsAllocated) {
    // An array of a billion Int32s in a 9-byte message.
    const std::string huge = bytes({0x86, 0x00, 0xCA, 0x9A, 0x3B, 1, 2, 3, 4});
    Reader r1(huge);
    DataValue d;
    EXPECT_THROW(DecodeVariant(r1, d), DecodeError);
    // A string longer than what is left.
    const std::string longText = bytes({12, 10, 0, 0, 0, 'a'});
    Reader r2(longText);
    EXPECT_THROW(DecodeVariant(r2, d), DecodeError);
    // A type id beyond the built-in ones.
    const std::string unknownType = bytes({26});
    Reader r3(unknownType);
    EXPECT_THROW(DecodeVariant(r3, d), DecodeError);
}

TEST(UaDataValue, MaskSaysWhichPartsFollow) {
    // Mask 0x07: value (Int32 5), status BadNodeIdUnknown, source time stamp 1.
    const std::string encoded =
        bytes({0x07, 6, 5, 0, 0, 0, 0, 0, 0x34, 0x80, 1, 0, 0, 0, 0, 0, 0, 0});
    Reader r(encoded);
    DataValue d;
    DecodeDataValue(r, d);
    EXPECT_EQ(d.value, Variant(5));
    EXPECT_EQ(d.status, 0x80340000u);
    EXPECT_EQ(d.sourceTime, 1);
    EXPECT_EQ(r.left(), 0u);
    EXPECT_EQ(StatusName(d.status), "BadNodeIdUnknown");
}

// ---- writes: the host's value converted to the variable's type and encoded ----

std::string encoded(const Variant& v, BuiltIn t) {
    std::string out;
    Writer w(out);
    EncodeVariant(w, v, t);
    return out;
}

TEST(UaWriteConversion, ValuesConvertToTheVariablesTypeOrAreRefused) {
    Variant out;
    bool range = false;
    ASSERT_TRUE(ConvertForType(Variant("321"), BuiltIn::Int16, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::Int16), bytes({4, 0x41, 0x01}));
    ASSERT_TRUE(ConvertForType(Variant(2.5), BuiltIn::Byte, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::Byte), bytes({3, 2}));  // half to even
    ASSERT_TRUE(ConvertForType(Variant(int32_t{65535}), BuiltIn::UInt16, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::UInt16), bytes({5, 0xFF, 0xFF}));
    ASSERT_TRUE(ConvertForType(Variant(4294967295.0), BuiltIn::UInt32, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::UInt32), bytes({7, 0xFF, 0xFF, 0xFF, 0xFF}));
    ASSERT_TRUE(ConvertForType(Variant(int16_t{-1}), BuiltIn::Boolean, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::Boolean), bytes({1, 1}));
    ASSERT_TRUE(ConvertForType(Variant(12), BuiltIn::LocalizedText, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::LocalizedText), bytes({21, 2, 2, 0, 0, 0, '1', '2'}));
    ASSERT_TRUE(ConvertForType(Variant(VbArray<Variant>(1, {Variant("1"), Variant(2.0)})),
                               BuiltIn::Int32, out, range));
    EXPECT_EQ(encoded(out, BuiltIn::Int32), bytes({0x86, 2, 0, 0, 0, 1, 0, 0, 0, 2, 0, 0, 0}));

    EXPECT_FALSE(ConvertForType(Variant(256), BuiltIn::Byte, out, range));
    EXPECT_TRUE(range);
    EXPECT_FALSE(ConvertForType(Variant(-1), BuiltIn::UInt32, out, range));
    EXPECT_TRUE(range);
    EXPECT_FALSE(ConvertForType(Variant(40000), BuiltIn::Int16, out, range));
    EXPECT_TRUE(range);
    EXPECT_FALSE(ConvertForType(Variant("abc"), BuiltIn::Double, out, range));
    EXPECT_FALSE(range);
    EXPECT_FALSE(ConvertForType(Variant(1), BuiltIn::Guid, out, range));
}

// ---- node ids ----

struct NodeIdCase {
    const char* text;
    std::string encoding;
};

TEST(UaNodeId, EachTextFormParsesAndEncodesInItsShortestForm) {
    const NodeIdCase cases[] = {
        {"i=85", bytes({0, 85})},                            // two-byte form
        {"ns=2;i=1025", bytes({1, 2, 0x01, 0x04})},          // four-byte form
        {"ns=300;i=7", bytes({2, 0x2C, 0x01, 7, 0, 0, 0})},  // numeric form
        {"i=70000", bytes({2, 0, 0, 0x70, 0x11, 0x01, 0})},
        {"ns=2;s=Line1.Level",
         bytes({3, 2, 0, 11, 0, 0, 0, 'L', 'i', 'n', 'e', '1', '.', 'L', 'e', 'v', 'e', 'l'})},
        {"ns=1;g=72962B91-FA75-4AE6-8D28-B404DC7DAF63",
         bytes({4, 1, 0, 0x91, 0x2B, 0x96, 0x72, 0x75, 0xFA, 0xE6, 0x4A, 0x8D, 0x28, 0xB4, 0x04,
                0xDC, 0x7D, 0xAF, 0x63})},
        {"ns=1;b=AQID", bytes({5, 1, 0, 3, 0, 0, 0, 1, 2, 3})},
    };
    for (const auto& c : cases) {
        NodeId id;
        ASSERT_TRUE(ParseNodeId(c.text, id)) << c.text;
        std::string out;
        Writer w(out);
        w.nodeId(id);
        EXPECT_EQ(out, c.encoding) << c.text;
        Reader r(out);
        NodeId back;
        r.nodeId(back);
        EXPECT_EQ(back, id) << c.text;
        EXPECT_EQ(NodeIdText(back), c.text);
    }
}

TEST(UaNodeId, NamespaceUrisAreKeptForTheServerToResolve) {
    NodeId id;
    ASSERT_TRUE(ParseNodeId("nsu=urn:a;b:c;s=X;Y", id));
    // The identifier starts at the last ";s=" the text has... unless the URI holds one:
    // a ';' in a string identifier is part of it when no "X=" follows.
    EXPECT_EQ(id.namespaceUri, "urn:a;b:c");
    EXPECT_EQ(id.text, "X;Y");
    ASSERT_TRUE(ParseNodeId("nsu=http://x.org/UA/;i=5", id));
    EXPECT_EQ(id.namespaceUri, "http://x.org/UA/");
    EXPECT_EQ(id.numeric, 5u);
}

TEST(UaNodeId, MalformedTextIsRefused) {
    NodeId id;
    for (const char* bad :
         {"", "Line1.Level", "ns=2", "ns=;s=x", "ns=70000;i=1", "ns=2;s=", "i=", "i=12a",
          "i=4294967296", "ns=1;g=1234", "ns=1;b=A", "ns=1;x=1", "nsu=;s", "ns=-1;i=2"})
        EXPECT_FALSE(ParseNodeId(bad, id)) << bad;
}

TEST(UaNodeId, ExpandedFormsCarryTheirNamespaceUri) {
    // Flags 0x80 (namespace URI) on a numeric four-byte form.
    const std::string expanded = bytes({0x81, 0, 5, 0, 3, 0, 0, 0, 'u', 'r', 'n'});
    Reader r(expanded);
    NodeId id;
    r.expandedNodeId(id);
    EXPECT_EQ(id.numeric, 5u);
    EXPECT_EQ(id.namespaceUri, "urn");
    // A plain node id with those flags is malformed.
    const std::string flagged = bytes({0x81, 0, 5, 0});
    Reader p(flagged);
    EXPECT_THROW(p.nodeId(id), DecodeError);
}

// ---- structures as descriptions ----

TEST(UaStructures, AReadRequestEncodesAsItsDescriptionSays) {
    std::vector<Value> v;
    AppendRequestHeader(v, NodeId{}, 0, 7, 2000);
    v.emplace_back().real = 0;    // maxAge
    v.emplace_back().number = 0;  // timestampsToReturn
    Value& len = v.emplace_back();
    len.isLength = true;
    len.count = 1;
    v.emplace_back().node = NodeId::Numeric(2255);
    v.emplace_back().number = 13;
    v.emplace_back().null = true;
    v.emplace_back().null = true;
    std::string out;
    Writer w(out);
    Encode(w, msg::ReadRequest, v);
    const std::string expected =
        bytes({0,    0,                                  // authenticationToken i=0
               0,    0,    0,    0,    0,    0,   0, 0,  // timestamp
               7,    0,    0,    0,                      // requestHandle
               0,    0,    0,    0,                      // returnDiagnostics
               0xFF, 0xFF, 0xFF, 0xFF,                   // auditEntryId null
               0xD0, 0x07, 0,    0,                      // timeoutHint 2000
               0,    0,    0,                            // additionalHeader: i=0, no body
               0,    0,    0,    0,    0,    0,   0, 0,  // maxAge
               0,    0,    0,    0,                      // timestampsToReturn
               1,    0,    0,    0,                      // one ReadValueId
               1,    0,    0xCF, 0x08,                   // i=2255
               13,   0,    0,    0,                      // Value attribute
               0xFF, 0xFF, 0xFF, 0xFF,                   // indexRange null
               0,    0,    0xFF, 0xFF, 0xFF, 0xFF});     // dataEncoding: ns 0, name null
    EXPECT_EQ(out, expected);
    // And a ReadRequest's values decode back to the same leaves.
    Reader r(out);
    std::vector<Value> back;
    Decode(r, msg::ReadRequest, back);
    ASSERT_EQ(back.size(), v.size());
    EXPECT_EQ(back[9].count, 1u);
    EXPECT_EQ(back[10].node.numeric, 2255u);
}

TEST(UaStructures, AResponseWithAStringTableStillDecodesItsResults) {
    const std::string body = bytes({0,    0,    0,    0,   0, 0, 0, 0,  // timestamp
                                    9,    0,    0,    0,                // requestHandle
                                    0,    0,    0,    0,                // serviceResult Good
                                    0,  // serviceDiagnostics: empty mask
                                    1,    0,    0,    0,   1, 0, 0, 0, 'x',  // stringTable ["x"]
                                    0,    0,    0,                           // additionalHeader
                                    1,    0,    0,    0,                     // one result
                                    0x01, 6,    42,   0,   0, 0,             // DataValue: Int32 42
                                    0xFF, 0xFF, 0xFF, 0xFF});                // diagnosticInfos null
    Reader r(body);
    std::vector<Value> v;
    Decode(r, msg::ReadResponse, v);
    EXPECT_EQ(r.left(), 0u);
    // Header leaves: 3, the table's length and its one string, then additionalHeader.
    EXPECT_EQ(v[7].count, 1u);
    EXPECT_EQ(v[8].data.value, Variant(42));
}

// ---- chunks ----

std::string chunk(const char* type, char final, uint32_t requestId, const std::string& body) {
    std::string out;
    Writer w(out);
    out.append(type, 3);
    w.u8(static_cast<uint8_t>(final));
    w.u32(static_cast<uint32_t>(24 + body.size()));
    w.u32(1);  // channel
    w.u32(1);  // token
    w.u32(5);  // sequence
    w.u32(requestId);
    out += body;
    return out;
}

TEST(UaChunkAssembly, ChunksOfAMessageAreJoinedWhateverTheStreamsSplit) {
    const std::string stream = chunk("MSG", 'C', 3, "abc") + chunk("MSG", 'C', 4, "XY") +
                               chunk("MSG", 'F', 3, "def") + chunk("MSG", 'F', 4, "Z");
    for (size_t step : {stream.size(), size_t{1}, size_t{7}}) {
        UaChunkAssembler a;
        std::vector<std::pair<uint32_t, std::string>> got;
        for (size_t at = 0; at < stream.size(); at += step)
            a.feed(std::string_view(stream).substr(at, step),
                   [&](const UaMessage& m) { got.emplace_back(m.requestId, std::string(m.body)); });
        const std::vector<std::pair<uint32_t, std::string>> expected = {{3, "abcdef"}, {4, "XYZ"}};
        EXPECT_EQ(got, expected) << "fed " << step << " bytes at a time";
    }
}

TEST(UaChunkAssembly, AnAbortChunkDropsTheMessageAndSaysWhy) {
    UaChunkAssembler a;
    std::vector<UaMessage> got;
    a.feed(chunk("MSG", 'C', 3, "abc") +
               chunk("MSG", 'A', 3, bytes({0, 0, 0x80, 0x80, 0, 0, 0, 0})) +
               chunk("MSG", 'F', 3, "new"),
           [&](const UaMessage& m) { got.push_back(m); });
    ASSERT_EQ(got.size(), 2u);
    EXPECT_TRUE(got[0].aborted);
    EXPECT_EQ(got[0].status, 0x80800000u);
    EXPECT_FALSE(got[1].aborted);
}

TEST(UaChunkAssembly, SizesBeyondTheNegotiatedLimitsEndTheConnection) {
    UaChunkAssembler a;
    a.setLimits({8192, 100, 2});
    const auto ignore = [](const UaMessage&) {};
    // A chunk larger than the receive buffer, told by its header alone.
    EXPECT_THROW(a.feed(bytes({'M', 'S', 'G', 'F', 0x01, 0x20, 0, 0}), ignore), DecodeError);
    a.reset();
    // More chunks than allowed.
    EXPECT_THROW(
        a.feed(chunk("MSG", 'C', 1, "a") + chunk("MSG", 'C', 1, "b") + chunk("MSG", 'C', 1, "c"),
               ignore),
        DecodeError);
    a.reset();
    // A message larger than allowed.
    EXPECT_THROW(a.feed(chunk("MSG", 'F', 1, std::string(101, 'x')), ignore), DecodeError);
    a.reset();
    EXPECT_THROW(a.feed(chunk("XYZ", 'F', 1, ""), ignore), DecodeError);
}

TEST(UaChunkAssembly, WrittenChunksStayWithinTheSizeAndReassemble) {
    const std::string body(5000, 'q');
    std::string out;
    uint32_t sequence = 10;
    WriteChunks(out, "MSG", 7, 8, sequence, 99, body, 1024);
    EXPECT_EQ(sequence, 15u);  // 5 chunks of at most 1024 bytes
    UaChunkAssembler a;
    std::string got;
    size_t messages = 0;
    a.feed(out, [&](const UaMessage& m) {
        ++messages;
        got = std::string(m.body);
        EXPECT_EQ(m.requestId, 99u);
    });
    EXPECT_EQ(messages, 1u);
    EXPECT_EQ(got, body);
}

}  // namespace
}  // namespace maroset::platform::opcua
