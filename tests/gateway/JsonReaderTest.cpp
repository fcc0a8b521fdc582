#include "gateway/JsonReader.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace maroset {
namespace {

using gateway::JsonReader;
using gateway::JsonValue;

TEST(JsonReader, ReadsEveryKindOfValue) {
    const JsonValue v = JsonReader::Parse(
        " {\"a\": [1, -2.5e1, 3000000000, true, false, null], \"b\": {\"c\": \"x\\\"\\u00e9\\n\"},"
        " \"a\": 0}\r\n");
    ASSERT_EQ(v.kind, JsonValue::Kind::Object);
    ASSERT_EQ(v.names.size(), 3u);
    ASSERT_EQ(v.values.size(), 3u);
    EXPECT_EQ(v.names[1], "b");
    const JsonValue& a = v.values[0];
    ASSERT_EQ(a.items.size(), 6u);
    EXPECT_TRUE(a.items[0].integral);
    EXPECT_EQ(a.items[0].number, 1);
    EXPECT_FALSE(a.items[1].integral);
    EXPECT_EQ(a.items[1].number, -25);
    EXPECT_FALSE(a.items[2].integral) << "beyond 32 bits";
    EXPECT_TRUE(a.items[3].boolean);
    EXPECT_EQ(a.items[4].kind, JsonValue::Kind::Boolean);
    EXPECT_EQ(a.items[5].kind, JsonValue::Kind::Null);
    EXPECT_EQ(v.member("b")->member("c")->text, "x\"\xE9\n");
    EXPECT_EQ(v.member("a")->number, 0) << "the last of a repeated name";
    EXPECT_EQ(JsonReader::Parse("\"caf\xC3\xA9\"").text, "caf\xE9");
}

TEST(JsonReader, RefusesWhatIsNotJson) {
    for (const std::string& text : std::vector<std::string>{"",
                                                            " ",
                                                            "{",
                                                            "[1,]",
                                                            "{\"a\":1,}",
                                                            "{a:1}",
                                                            "01",
                                                            "1.",
                                                            ".5",
                                                            "-",
                                                            "1e",
                                                            "+1",
                                                            "tru",
                                                            "nul",
                                                            "\"abc",
                                                            "\"\\x\"",
                                                            "\"\\u12\"",
                                                            "\"a\tb\"",
                                                            "[1 2]",
                                                            "{\"a\" 1}",
                                                            "1 2",
                                                            "1e999",
                                                            std::string("\"\0\"", 3),
                                                            "\"\xC3\"",
                                                            "\"\xC3(\"",
                                                            "\"\x80\"",
                                                            "\"\xC0\xA0\""}) {
        EXPECT_THROW(JsonReader::Parse(text), JsonReader::Error) << text;
    }
}

TEST(JsonReader, KeepsToLatin1AndToItsBounds) {
    // Text is Latin-1 bytes in the library: beyond U+00FF cannot be held.
    EXPECT_THROW(JsonReader::Parse("\"\\u0100\""), JsonReader::Error);
    EXPECT_THROW(JsonReader::Parse("\"\\ud83d\\ude00\""), JsonReader::Error);
    EXPECT_THROW(JsonReader::Parse("\"\xE2\x82\xAC\""), JsonReader::Error);
    EXPECT_EQ(JsonReader::Parse("\"\\u00ff\"").text, "\xFF");

    const std::string deep(JsonReader::MaxDepth, '[');
    EXPECT_NO_THROW(JsonReader::Parse(deep + std::string(JsonReader::MaxDepth, ']')));
    EXPECT_THROW(JsonReader::Parse("[" + deep + std::string(JsonReader::MaxDepth + 1, ']')),
                 JsonReader::Error);
    // Deep enough to overflow a stack if nesting were not bounded.
    EXPECT_THROW(JsonReader::Parse(std::string(60000, '[')), JsonReader::Error);
    EXPECT_THROW(JsonReader::Parse("\"" + std::string(JsonReader::MaxSize, 'x') + "\""),
                 JsonReader::Error);
}

}  // namespace
}  // namespace maroset
