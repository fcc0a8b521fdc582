#include "drivers/intech/FrmNUVIntech.h"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "drivers/intech/IntechCollector.h"
#include "drivers/intech/IntechTagName.h"
#include "support/ErrorOf.h"

namespace maroset {
namespace {

TEST(IntechBcc, SumsEveryCharacterAfterTheFirstAndDropsTheLeadingZero) {
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@01EX DI:"), "E5");
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@01OK:"), "35");
    // Whatever the first character is, it is never summed.
    EXPECT_EQ(FrmNUVIntech::CalcBCC("X01OK:"), "35");
    EXPECT_EQ(FrmNUVIntech::CalcBCC(""), "0");
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@"), "0");
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\x05"), "5") << "a sum below 16 has one digit";
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\x10"), "10");
    // Bytes from 0x80 count as 128-255, and the sum wraps at 256.
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\xFF\x02"), "1");
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\x80\x7F"), "FF");
}

TEST(IntechSingles, HexToSingleReadsMostSignificantFirstAndSingleToHexWritesTheReverse) {
    EXPECT_EQ(FrmNUVIntech::HexToSingle("42C80000"), 100.0f);
    EXPECT_EQ(FrmNUVIntech::HexToSingle("c2c80000"), -100.0f);
    EXPECT_EQ(FrmNUVIntech::HexToSingle("3F800000"), 1.0f);
    EXPECT_FLOAT_EQ(FrmNUVIntech::HexToSingle("40490FDB"), 3.14159274f);
    EXPECT_TRUE(std::isnan(FrmNUVIntech::HexToSingle("7FC00000")));
    for (const char* other : {"", "42C8000", "42C800000", "0"})
        EXPECT_EQ(FrmNUVIntech::HexToSingle(other), 0.0f) << other;
    EXPECT_EQ(test::errorOf([] { FrmNUVIntech::HexToSingle("42C8000G"); }), 13);

    // Memory order, lowest byte first: not what HexToSingle reads back.
    EXPECT_EQ(FrmNUVIntech::SingleToHex(100.0f), "0000C842");
    EXPECT_EQ(FrmNUVIntech::SingleToHex(-1.0f), "000080BF");
    EXPECT_EQ(FrmNUVIntech::HexToSingle(FrmNUVIntech::SingleToHex(1.0f)),
              FrmNUVIntech::HexToSingle("0000803F"));
}

// Feeds text one character per receive event; returns the frames completed on the way.
std::vector<std::string> feedAll(IntechCollector& c, std::string_view text) {
    std::vector<std::string> frames;
    for (const char ch : text)
        if (c.feed(std::string_view(&ch, 1))) frames.push_back(c.RxBuffer());
    return frames;
}

using Frames = std::vector<std::string>;

TEST(IntechCollectorSteps, AFrameIsTheAtSignUpToTheColonAndTwoMoreCharacters) {
    IntechCollector c;
    EXPECT_EQ(feedAll(c, "@01EX DI 0003 0015:4C\r@01OK:35\r"),
              (Frames{"@01EX DI 0003 0015:4C", "@01OK:35"}));
    EXPECT_FALSE(c.Receiving());
    EXPECT_EQ(c.dropped(), 0) << "the carriage return after a frame is expected";

    // A second ":" inside the two trailing characters does not extend the frame.
    EXPECT_EQ(feedAll(c, "@01:::x"), Frames{"@01:::"});
    // A new "@" restarts collection, dropping what came before it.
    EXPECT_EQ(feedAll(c, "@01EX E5@01OK:35"), Frames{"@01OK:35"});
    // Before the ":" any length is collected.
    EXPECT_EQ(feedAll(c, "@" + std::string(500, 'A') + ":12"),
              Frames{"@" + std::string(500, 'A') + ":12"});
}

TEST(IntechCollectorSteps, NoiseOutsideAFrameIsDroppedAndCounted) {
    IntechCollector c;
    EXPECT_TRUE(feedAll(c, "noise:\r\n12345678901234567890").empty());
    EXPECT_EQ(c.dropped(), 26);
    EXPECT_EQ(c.droppedSample(), "noise:1234567890");
    c.takeDropped();
    EXPECT_EQ(c.dropped(), 0);
    EXPECT_EQ(feedAll(c, "OK:35@01OK:35"), Frames{"@01OK:35"});
    EXPECT_EQ(c.dropped(), 5);
}

TEST(IntechCollectorSteps, AFrameCutOffOnePastItsColonMakesTheNextEndOneEarly) {
    IntechCollector c;
    EXPECT_TRUE(feedAll(c, "@01OK:3").empty());
    EXPECT_EQ(c.TrailCount(), 1);
    // The new "@" clears ColonSeen but not TrailCount: intended.
    EXPECT_EQ(feedAll(c, "@01EX DI 0003 0015:4C\r"), Frames{"@01EX DI 0003 0015:4"});
    EXPECT_EQ(c.TrailCount(), 0);
    EXPECT_EQ(feedAll(c, "@01OK:35\r"), Frames{"@01OK:35"});
}

struct TagCommand {
    const char* tag;
    const char* command;
};

TEST(IntechTagNames, EachKindAndPointRangePicksItsReadCommand) {
    const TagCommand cases[] = {
        {"01LAI1", "@01EX E5 00:"},
        {"01LAI4", "@01EX E5 00:"},
        {"01LAI5", "@01EX E5 01:"},
        {"01LAI8", "@01EX E5 01:"},
        {"02LAI9", "@02EX E5 02:"},
        {"01LAI12", "@01EX E5 02:"},
        {"01LAI13", "@01EX E5 03:"},
        {"01LAI16", "@01EX E5 03:"},
        {"01LAI17", ""},
        {"01LAI0", ""},
        {"01LAI01", "@01EX E5 00:"},
        {"01LAI2.5", "@01EX E5 00:"},
        {"01LAI4.5", ""},
        {"01lai3", "@01EX E5 00:"},
        {"02LDI4", "@02EX DI:"},
        {"01LDO1", "@01EX DI:"},
        {"01ldo1", "@01EX DI:"},
        {"01LDI99", "@01EX DI:"},
        {"01LDIx", "@01EX DI:"},
        {"01LDO", "@01EX DI:"},
        {"01EAI1", "@01EX E1:"},
        {"01EAI16", "@01EX E1:"},
        {"01EAI17", "@01EX E2:"},
        {"01EAI33", "@01EX E3:"},
        {"01EAI48", "@01EX E3:"},
        {"01EAI49", "@01EX E4:"},
        {"01EAI64", "@01EX E4:"},
        {"01EAI65", ""},
        {"01XYZ1", ""},
        {"", ""},
        {"0", ""},
        {"ab", ""},
        {"A1LAI1", "@A1EX E5 00:"},
    };
    for (const auto& c : cases) EXPECT_EQ(IntechTagName::ReadCommand(c.tag), c.command) << c.tag;
}

TEST(IntechTagNames, AnAnalogPointThatIsNotANumberIsATypeMismatch) {
    for (const char* tag : {"01LAIx", "01LAI", "01EAI", "01EAI1x", "01lai?"})
        EXPECT_EQ(test::errorOf([&] { IntechTagName::ReadCommand(tag); }), 13) << tag;
}

}  // namespace
}  // namespace maroset
