#include "platform/JetLike.h"

#include <gtest/gtest.h>

#include "core/VbError.h"

namespace maroset::platform {
namespace {

struct LikeCase {
    const char* text;
    const char* pattern;
    bool matches;
};

class JetLikeMatching : public ::testing::TestWithParam<LikeCase> {};

TEST_P(JetLikeMatching, MatchesAsTheEngineDoes) {
    const LikeCase& c = GetParam();
    EXPECT_EQ(JetLike(c.text, c.pattern), c.matches)
        << "'" << c.text << "' like '" << c.pattern << "'";
}

INSTANTIATE_TEST_SUITE_P(Wildcards, JetLikeMatching,
                         ::testing::Values(
                             // Plain text, without regard to case.
                             LikeCase{"Level", "Level", true}, LikeCase{"LEVEL", "level", true},
                             LikeCase{"Level", "Leve", false}, LikeCase{"Leve", "Level", false},
                             LikeCase{"", "", true}, LikeCase{"a", "", false},
                             // Star: any run, the empty one included, anywhere in the pattern.
                             LikeCase{"Level", "Lev*", true}, LikeCase{"Lev", "Lev*", true},
                             LikeCase{"Level", "*vel", true}, LikeCase{"Level", "*", true},
                             LikeCase{"", "*", true}, LikeCase{"Level2", "L*l", false},
                             LikeCase{"abcbcd", "a*bcd", true}, LikeCase{"abcbcx", "a*bcd", false},
                             LikeCase{"mississippi", "*sip*", true}, LikeCase{"aaa", "a**a", true},
                             LikeCase{"ab", "a*b*c", false},
                             // Question mark: exactly one character.
                             LikeCase{"Tank1", "Tank?", true}, LikeCase{"Tank", "Tank?", false},
                             LikeCase{"Tank12", "Tank?", false}, LikeCase{"Tank?", "Tank?", true},
                             // Hash: one digit, and only a digit.
                             LikeCase{"N7:12", "N7:##", true}, LikeCase{"N7:1a", "N7:##", false},
                             LikeCase{"N7:1", "N7:##", false}, LikeCase{"#", "#", false},
                             // SQL's own wildcards are ordinary characters here.
                             LikeCase{"50%", "50%", true}, LikeCase{"50 percent", "50%", false},
                             LikeCase{"a_b", "a_b", true}, LikeCase{"axb", "a_b", false},
                             LikeCase{"axb", "a%", false}));

INSTANTIATE_TEST_SUITE_P(
    CharacterLists, JetLikeMatching,
    ::testing::Values(
        LikeCase{"b", "[abc]", true}, LikeCase{"d", "[abc]", false}, LikeCase{"B", "[abc]", true},
        LikeCase{"d", "[!abc]", true}, LikeCase{"a", "[!abc]", false}, LikeCase{"", "[abc]", false},
        // Ranges, either case of a letter.
        LikeCase{"q", "[a-z]", true}, LikeCase{"Q", "[a-z]", true}, LikeCase{"q", "[A-Z]", true},
        LikeCase{"5", "[a-z]", false}, LikeCase{"C", "[0-9A-F]", true},
        LikeCase{"G", "[0-9A-F]", false}, LikeCase{"5", "[!0-9]", false},
        // Special characters inside a list are themselves.
        LikeCase{"*", "[*]", true}, LikeCase{"x", "[*]", false}, LikeCase{"?", "[?]", true},
        LikeCase{"#", "[#]", true}, LikeCase{"[", "[[]", true}, LikeCase{"-", "[a-]", true},
        LikeCase{"-", "[-a]", true}, LikeCase{"b", "[-a]", false}, LikeCase{"!", "[a!]", true},
        // A list takes one character; an empty list takes none.
        LikeCase{"Tank[1]", "Tank[[]1]", true}, LikeCase{"ab", "a[]b", true},
        LikeCase{"axb", "a[!]b", true}, LikeCase{"a]", "a]", true},
        LikeCase{"Level", "L[ae]v*", true}, LikeCase{"Lxvel", "L[ae]v*", false}));

INSTANTIATE_TEST_SUITE_P(Latin1, JetLikeMatching,
                         ::testing::Values(LikeCase{"\xC9t\xE9", "\xE9T\xC9", true},  // Été
                                           LikeCase{"\xD7", "\xF7", false},  // × is not ÷
                                           LikeCase{"\xE9", "[\xC0-\xDE]", true}));

TEST(JetLikePatterns, MalformedPatternsFailWithInvalidPatternString) {
    for (const char* pattern : {"[abc", "Tank[", "[z-a]", "[!"}) {
        try {
            JetLike("x", pattern);
            ADD_FAILURE() << pattern << " was accepted";
        } catch (const VbError& e) {
            EXPECT_EQ(e.number(), InvalidPatternString) << pattern;
        }
    }
}

TEST(JetLikePatterns, EscapeCharacterMakesTheNextCharacterOrdinary) {
    EXPECT_TRUE(JetLike("a*b", "a\\*b", '\\'));
    EXPECT_FALSE(JetLike("axb", "a\\*b", '\\'));
    EXPECT_TRUE(JetLike("a]", "a[\\]]", '\\'));
    EXPECT_THROW(JetLike("a", "a\\", '\\'), VbError);
}

TEST(JetLikePatterns, LongStarPatternsStayFast) {
    // Backing up to the last star only: no exponential blow-up on many stars.
    const std::string text(5000, 'a');
    EXPECT_FALSE(JetLike(text, "*a*a*a*a*a*a*a*a*a*a*b"));
    EXPECT_TRUE(JetLike(text + "b", "*a*a*a*a*a*a*a*a*a*a*b"));
}

}  // namespace
}  // namespace maroset::platform
