#include "lang/Format.h"

#include <gtest/gtest.h>

#include <limits>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;
using Row = std::pair<Variant, const char*>;

template <size_t N>
void expectFormat(const char* pattern, const Row (&rows)[N]) {
    for (const auto& [in, out] : rows)
        EXPECT_EQ(Format(in, pattern), out) << ::testing::PrintToString(in) << " as " << pattern;
}

// Whole numbers round half away from zero, unlike CInt; numeric text is read as a number. With
// one decimal the decimal value shown is rounded: 2.25 is not below its binary neighbour, and
// a Single rounds at its seven digits (2.05f is 2.04999995..., shown as 2.05).
TEST(FormatPatterns, NumbersPaddedRoundedAndTextRightAligned) {
    const Row zeroPadded[] = {
        {5, "005"},     {1234, "1234"},  {-7, "-007"},      {Variant(), "000"}, {true, "-001"},
        {2.5, "003"},   {4.5f, "005"},   {2.4999, "002"},   {999.5, "1000"},    {-2.5, "-003"},
        {" 7 ", "007"}, {"&HFF", "255"}, {"1,500", "1500"}, {"abc", "abc"},     {"", ""},
    };
    expectFormat("000", zeroPadded);
    const Row whole[] = {
        {2.5, "3"}, {-2.5, "-3"}, {0.49, "0"}, {99.5, "100"}, {Variant(), "0"}, {"12abc", "12abc"},
    };
    expectFormat("###0", whole);
    const Row oneDecimal[] = {
        {2.25, "2.3"},   {1.005 * 10, "10.1"}, {12.0, "12.0"},   {3, "3.0"},
        {9.96, "10.0"},  {99.95, "100.0"},     {0.05, "0.1"},    {1e-7, "0.0"},
        {-0.04, "-0.0"}, {2.05f, "2.1"},       {12.35f, "12.4"}, {1234.56f, "1234.6"},
    };
    expectFormat("###0.0", oneDecimal);
    const Row rightAligned[] = {
        {"5", "  5"}, {"abcd", "abcd"}, {"", "   "}, {Variant(), "   "}, {12, " 12"}, {0.5f, "0.5"},
    };
    expectFormat("@@@", rightAligned);
    EXPECT_EQ(Format(1e20, "000"), "100000000000000000000");
    EXPECT_EQ(Format(INT32_MIN, "###0"), "-2147483648");
    EXPECT_EQ(Format(std::numeric_limits<double>::infinity(), "###0.0"), "1.#INF");
}

TEST(FormatPatterns, NullIsEmptyTextOtherPatternsFail) {
    for (const char* pattern : {"000", "###0", "###0.0", "@@@", "0.00"})
        EXPECT_EQ(Format(Variant::Null(), pattern), "") << pattern;
    for (const char* pattern : {"00", ""}) EXPECT_EQ(errorOf([&] { Format(1, pattern); }), 5);
    EXPECT_EQ(errorOf([] { Format("x", "0000"); }), 5);
    EXPECT_EQ(errorOf([] { Format(Variant(VbArray<Variant>(0, 0)), "000"); }), 13);
}

}  // namespace
}  // namespace maroset
