#include "drivers/intech/FrmNUVIntech.h"

#include <gtest/gtest.h>

#include <string>

#include "drivers/intech/IntechCollector.h"
#include "drivers/intech/IntechTagName.h"
#include "support/ErrorOf.h"

namespace maroset {
namespace {

TEST(IntechChecks, TheBccDropsItsLeadingZeroAndTheSingleConvertersAreAsymmetric) {
    EXPECT_EQ(FrmNUVIntech::CalcBCC("X01OK:"), "35") << "the first character is never summed";
    EXPECT_EQ(FrmNUVIntech::CalcBCC(""), "0");
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\x05"), "5") << "a sum below 16 has one digit";
    EXPECT_EQ(FrmNUVIntech::CalcBCC("@\xFF\x02"), "1") << "bytes are unsigned, the sum wraps";
    EXPECT_EQ(FrmNUVIntech::HexToSingle("c2c80000"), -100.0f);
    for (const char* other : {"", "42C8000", "42C800000"})
        EXPECT_EQ(FrmNUVIntech::HexToSingle(other), 0.0f) << other;
    EXPECT_EQ(test::errorOf([] { FrmNUVIntech::HexToSingle("42C8000G"); }), 13);
    // Memory order, lowest byte first: not what HexToSingle reads back.
    EXPECT_EQ(FrmNUVIntech::SingleToHex(100.0f), "0000C842");
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
    EXPECT_EQ(c.dropped(), 0) << "the carriage return after a frame is expected";
    // A ":" among the two trailing characters does not extend the frame; a new "@"
    // restarts it.
    EXPECT_EQ(feedAll(c, "@01:::x@01EX E5@01OK:35"), (Frames{"@01:::", "@01OK:35"}));
    EXPECT_EQ(c.dropped(), 1);
    // Cut one past its ":", a frame leaves TrailCount at 1 for the next, which ends one
    // character early: intended.
    EXPECT_TRUE(feedAll(c, "@01OK:3").empty());
    EXPECT_EQ(feedAll(c, "@01EX DI 0003 0015:4C\r@01OK:35"),
              (Frames{"@01EX DI 0003 0015:4", "@01OK:35"}));
}

TEST(IntechTagNames, EachKindAndPointRangePicksItsReadCommand) {
    // clang-format off
    const std::pair<const char*, const char*> cases[] = {
        {"01LAI1", "@01EX E5 00:"},  {"01LAI4", "@01EX E5 00:"}, {"01LAI5", "@01EX E5 01:"},
        {"02LAI12", "@02EX E5 02:"}, {"01LAI16", "@01EX E5 03:"}, {"01LAI17", ""},
        {"01LAI0", ""},              {"01LAI4.5", ""},            {"01lai01", "@01EX E5 00:"},
        {"02LDI4", "@02EX DI:"},     {"01ldo1", "@01EX DI:"},     {"01LDIx", "@01EX DI:"},
        {"01EAI16", "@01EX E1:"},    {"01EAI17", "@01EX E2:"},    {"01EAI48", "@01EX E3:"},
        {"01EAI49", "@01EX E4:"},    {"01EAI65", ""},             {"01XYZ1", ""}, {"", ""}};
    // clang-format on
    for (const auto& [tag, command] : cases)
        EXPECT_EQ(IntechTagName::ReadCommand(tag), command) << tag;
    // Analog points are compared as numbers; one that is not a number is a type mismatch.
    for (const char* tag : {"01LAIx", "01LAI", "01EAI1x"})
        EXPECT_EQ(test::errorOf([&] { IntechTagName::ReadCommand(tag); }), 13) << tag;
}

}  // namespace
}  // namespace maroset
