#include "core/Format.h"

#include <gtest/gtest.h>

#include <limits>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

TEST(FormatZeroPadded, AtLeastThreeDigits) {
    EXPECT_EQ(Format(int32_t{5}, "000"), "005");
    EXPECT_EQ(Format(int16_t{0}, "000"), "000");
    EXPECT_EQ(Format(int32_t{255}, "000"), "255");
    EXPECT_EQ(Format(int32_t{1234}, "000"), "1234");
    EXPECT_EQ(Format(int32_t{-7}, "000"), "-007");
    EXPECT_EQ(Format(Variant(), "000"), "000");
    EXPECT_EQ(Format(true, "000"), "-001");
    EXPECT_EQ(Format(1e20, "000"), "100000000000000000000");
}

TEST(FormatZeroPadded, FractionsRoundHalfAwayFromZero) {
    EXPECT_EQ(Format(2.5, "000"), "003");
    EXPECT_EQ(Format(4.5f, "000"), "005");
    EXPECT_EQ(Format(2.4999, "000"), "002");
    EXPECT_EQ(Format(999.5, "000"), "1000");
    EXPECT_EQ(Format(-2.5, "000"), "-003");
}

TEST(FormatZeroPadded, NumericTextIsReadAsANumber) {
    EXPECT_EQ(Format("12", "000"), "012");
    EXPECT_EQ(Format(" 7 ", "000"), "007");
    EXPECT_EQ(Format("&HFF", "000"), "255");
    EXPECT_EQ(Format("1,500", "000"), "1500");
    EXPECT_EQ(Format("abc", "000"), "abc");
    EXPECT_EQ(Format("", "000"), "");
    EXPECT_EQ(Format("12abc", "###0"), "12abc");
}

TEST(FormatWholeNumber, NoPaddingRoundsHalfAwayFromZero) {
    EXPECT_EQ(Format(2.5, "###0"), "3");
    EXPECT_EQ(Format(-2.5, "###0"), "-3");
    EXPECT_EQ(Format(3.5, "###0"), "4");
    EXPECT_EQ(Format(0.49, "###0"), "0");
    EXPECT_EQ(Format(int32_t{0}, "###0"), "0");
    EXPECT_EQ(Format(int32_t{4095}, "###0"), "4095");
    EXPECT_EQ(Format(Variant(), "###0"), "0");
    EXPECT_EQ(Format(99.5, "###0"), "100");
    EXPECT_EQ(Format(INT32_MIN, "###0"), "-2147483648");
}

TEST(FormatOneDecimal, RoundsTheDecimalValueShown) {
    EXPECT_EQ(Format(2.25, "###0.0"), "2.3");  // 2.25 is not below its binary neighbour
    EXPECT_EQ(Format(1.005 * 10, "###0.0"), "10.1");
    EXPECT_EQ(Format(-2.25, "###0.0"), "-2.3");
    EXPECT_EQ(Format(12.0, "###0.0"), "12.0");
    EXPECT_EQ(Format(int32_t{3}, "###0.0"), "3.0");
    EXPECT_EQ(Format(9.96, "###0.0"), "10.0");
    EXPECT_EQ(Format(99.95, "###0.0"), "100.0");
    EXPECT_EQ(Format(0.05, "###0.0"), "0.1");
    EXPECT_EQ(Format(0.04, "###0.0"), "0.0");
    EXPECT_EQ(Format(1e-7, "###0.0"), "0.0");
    EXPECT_EQ(Format("2.25", "###0.0"), "2.3");
    // A small negative value keeps its sign, as the language shows it.
    EXPECT_EQ(Format(-0.04, "###0.0"), "-0.0");
}

TEST(FormatOneDecimal, SingleRoundsAtItsSevenDigits) {
    // 2.05f is 2.04999995..., shown as 2.05 and so rounded up.
    EXPECT_EQ(Format(2.05f, "###0.0"), "2.1");
    EXPECT_EQ(Format(12.35f, "###0.0"), "12.4");
    EXPECT_EQ(Format(-40.0f, "###0.0"), "-40.0");
    EXPECT_EQ(Format(1234.56f, "###0.0"), "1234.6");
}

TEST(FormatRightAligned, TextPaddedOnTheLeftToThree) {
    EXPECT_EQ(Format("5", "@@@"), "  5");
    EXPECT_EQ(Format("ACK", "@@@"), "ACK");
    EXPECT_EQ(Format("abcd", "@@@"), "abcd");
    EXPECT_EQ(Format("", "@@@"), "   ");
    EXPECT_EQ(Format(Variant(), "@@@"), "   ");
    EXPECT_EQ(Format(int32_t{12}, "@@@"), " 12");
    EXPECT_EQ(Format(1.5, "@@@"), "1.5");
    EXPECT_EQ(Format(0.5f, "@@@"), "0.5");
}

TEST(FormatSpecialValues, NullIsEmptyTextOtherPatternsFail) {
    EXPECT_EQ(Format(Variant::Null(), "000"), "");
    EXPECT_EQ(Format(Variant::Null(), "@@@"), "");
    EXPECT_EQ(Format(Variant::Null(), "0.00"), "");
    EXPECT_EQ(errorOf([] { Format(int32_t{1}, "00"); }), 5);
    EXPECT_EQ(errorOf([] { Format(int32_t{1}, ""); }), 5);
    EXPECT_EQ(errorOf([] { Format("x", "0000"); }), 5);
    EXPECT_EQ(errorOf([] { Format(Variant(VbArray<Variant>(0, 0)), "000"); }), 13);
    EXPECT_EQ(Format(std::numeric_limits<double>::infinity(), "###0.0"), "1.#INF");
}

}  // namespace
}  // namespace maroset
