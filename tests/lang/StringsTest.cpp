#include "lang/Strings.h"

#include <gtest/gtest.h>

#include "support/ErrorOf.h"

namespace maroset {
namespace {

TEST(LanguageStrings, PositionsCountFromOneAndRunPastTheEndQuietly) {
    EXPECT_EQ(Mid("N7:12", 4), "12");
    EXPECT_EQ(Mid("N7:12", 1, 2), "N7");
    EXPECT_EQ(Mid("abc", 4), "");
    EXPECT_EQ(Mid("abc", 2, 10), "bc");
    EXPECT_EQ(Left("abc", 5), "abc");
    EXPECT_EQ(Right("abcdef", 2), "ef");
    EXPECT_EQ(Right("ab", 5), "ab");
    EXPECT_EQ(UCase("n7;ab\xe9"), "N7;AB\xe9");
    EXPECT_EQ(LCase("LAI"), "lai");
    EXPECT_EQ(Trim("  a b "), "a b");
    EXPECT_EQ(Trim("   "), "");
    for (auto bad : {+[] { Mid("a", 0); }, +[] { Mid("a", 1, -1); }, +[] { Left("a", -1); },
                     +[] { InStr(0, "a", "a"); }})
        EXPECT_EQ(test::errorOf(bad), 5);
}

TEST(LanguageStrings, InStrFindsFromTheStartAndTreatsEmptyTextAsTheLanguageDoes) {
    EXPECT_EQ(InStr("B3:0/2", "/"), 5);
    EXPECT_EQ(InStr(3, "T4:0.ACC", "."), 5);
    EXPECT_EQ(InStr(3, "N7.0", "."), 3);
    EXPECT_EQ(InStr(4, "N7.0", "."), 0);
    EXPECT_EQ(InStr("abc", "x"), 0);
    EXPECT_EQ(InStr("", ""), 0);
    EXPECT_EQ(InStr(2, "abc", ""), 2);
    EXPECT_EQ(InStr(9, "abc", "c"), 0);
}

TEST(LanguageStrings, SplitKeepsEmptyPiecesAndGivesNoPiecesForEmptyText) {
    const auto parts = Split(";~1;~7;~12.5;~", ";~");
    EXPECT_EQ(parts.LBound(), 0);
    EXPECT_EQ(parts.items(), (std::vector<std::string>{"", "1", "7", "12.5", ""}));
    EXPECT_EQ(Split("", ";~").UBound(), -1);
    EXPECT_EQ(Split("abc", ",").items(), std::vector<std::string>{"abc"});
}

}  // namespace
}  // namespace maroset
