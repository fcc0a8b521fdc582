#include "platform/JetLike.h"

#include <gtest/gtest.h>

#include "support/ErrorOf.h"

namespace maroset::platform {
namespace {

using test::errorOf;

// Letters compare without regard to case; SQL's % and _ are ordinary characters here.
TEST(JetLikeMatching, WildcardsListsMalformedPatternsAndEscape) {
    // {text, pattern, whether the text is like the pattern}
    const std::tuple<const char*, const char*, bool> rows[] = {
        {"", "", true},         {"LEVEL", "level", true},   {"Level", "Leve", false},
        {"a", "", false},       {"Lev", "Lev*", true},      {"Level", "*vel", true},
        {"", "*", true},        {"Level2", "L*l", false},   {"abcbcd", "a*bcd", true},
        {"ab", "a*b*c", false}, {"abcbcx", "a*bcd", false}, {"Tank1", "Tank?", true},
        {"#", "#", false},      {"Tank", "Tank?", false},   {"Tank12", "Tank?", false},
        {"50%", "50%", true},   {"N7:12", "N7:##", true},   {"N7:1a", "N7:##", false},
        {"a_b", "a_b", true},   {"axb", "a_b", false},      {"50 percent", "50%", false},
        {"B", "[abc]", true},   {"d", "[abc]", false},      {"d", "[!abc]", true},
        {"", "[abc]", false},   {"a", "[!abc]", false},     {"Q", "[a-z]", true},
        {"5", "[a-z]", false},  {"C", "[0-9A-F]", true},    {"5", "[!0-9]", false},
        {"*", "[*]", true},     {"?", "[?]", true},         {"[", "[[]", true},
        {"-", "[-a]", true},    {"!", "[a!]", true},        {"ab", "a[]b", true},
        {"axb", "a[!]b", true}, {"a]", "a]", true},         {"Lxvel", "L[ae]v*", false},
    };
    for (const auto& [text, pattern, matches] : rows)
        EXPECT_EQ(JetLike(text, pattern), matches) << "'" << text << "' like '" << pattern << "'";
    EXPECT_TRUE(JetLike("\xC9t\xE9", "\xE9T\xC9"));  // Latin-1 letters too
    EXPECT_TRUE(JetLike("\xE9", "[\xC0-\xDE]"));
    EXPECT_FALSE(JetLike("\xD7", "\xF7"));  // × is not ÷
    for (const char* pattern : {"[abc", "Tank[", "[z-a]", "[!"})
        EXPECT_EQ(errorOf([&] { JetLike("x", pattern); }), InvalidPatternString) << pattern;
    EXPECT_EQ(errorOf([] { JetLike("a", "a\\", '\\'); }), InvalidPatternString);
    EXPECT_TRUE(JetLike("a*b", "a\\*b", '\\'));
    EXPECT_FALSE(JetLike("axb", "a\\*b", '\\'));
    EXPECT_TRUE(JetLike("a]", "a[\\]]", '\\'));
    // Backing up to the last star only: many stars do not blow up.
    EXPECT_FALSE(JetLike(std::string(5000, 'a'), "*a*a*a*a*a*a*a*a*a*a*b"));
}

}  // namespace
}  // namespace maroset::platform
