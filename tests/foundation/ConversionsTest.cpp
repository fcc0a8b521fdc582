#include "core/Conversions.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace maroset {
namespace {

template <class F>
int32_t errorOf(F&& f) {
    try {
        f();
    } catch (const VbError& e) {
        return e.number();
    }
    return 0;
}

const Variant kNull = Variant::Null();
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

// ---- Whole numbers: banker's rounding and the 16/32-bit limits -------------------------

TEST(IntegerConversionRounding, HalvesGoToTheEvenNeighbour) {
    EXPECT_EQ(CInt(2.5), 2);
    EXPECT_EQ(CInt(3.5), 4);
    EXPECT_EQ(CInt(-2.5), -2);
    EXPECT_EQ(CInt(-3.5), -4);
    EXPECT_EQ(CInt(0.5), 0);
    EXPECT_EQ(CInt(1.5), 2);
    EXPECT_EQ(CInt(-0.5), 0);
    EXPECT_EQ(CLng(2.5f), 2);
    EXPECT_EQ(CLng(1000001.5), 1000002);
    // Not halves: ordinary rounding, not truncation.
    EXPECT_EQ(CInt(2.5000001), 3);
    EXPECT_EQ(CInt(2.4999999), 2);
    EXPECT_EQ(CInt(-1.6), -2);
    EXPECT_EQ(CLng(-0.4), 0);
}

TEST(IntegerConversionLimits, IntegerIsSixteenBits) {
    EXPECT_EQ(CInt(32767.0), 32767);
    EXPECT_EQ(CInt(32767.4), 32767);
    EXPECT_EQ(errorOf([] { CInt(32767.5); }), 6);
    EXPECT_EQ(CInt(-32768.5), -32768);
    EXPECT_EQ(errorOf([] { CInt(-32769.0); }), 6);
    EXPECT_EQ(errorOf([] { CInt(int32_t{32768}); }), 6);
    EXPECT_EQ(CInt(int32_t{-32768}), -32768);
    EXPECT_EQ(errorOf([] { CInt(1e300); }), 6);
}

TEST(IntegerConversionLimits, LongIsThirtyTwoBits) {
    EXPECT_EQ(CLng(2147483647.0), 2147483647);
    EXPECT_EQ(errorOf([] { CLng(2147483647.5); }), 6);
    EXPECT_EQ(CLng(-2147483648.5), INT32_MIN);
    EXPECT_EQ(errorOf([] { CLng(-2147483649.0); }), 6);
    EXPECT_EQ(errorOf([] { CLng(3e9f); }), 6);
}

TEST(IntegerConversionLimits, NotANumberAndInfinityOverflow) {
    EXPECT_EQ(errorOf([] { CInt(kNaN); }), 6);
    EXPECT_EQ(errorOf([] { CLng(kInf); }), 6);
    EXPECT_EQ(errorOf([] { CLng(static_cast<float>(-kInf)); }), 6);
    EXPECT_EQ(errorOf([] { CInt(std::numeric_limits<float>::quiet_NaN()); }), 6);
}

TEST(IntegerConversionKinds, BooleanEmptyAndNull) {
    EXPECT_EQ(CInt(true), -1);
    EXPECT_EQ(CLng(false), 0);
    EXPECT_EQ(CInt(Variant()), 0);
    EXPECT_EQ(CLng(Variant()), 0);
    EXPECT_EQ(errorOf([] { CInt(kNull); }), 94);
    EXPECT_EQ(errorOf([] { CLng(kNull); }), 94);
    EXPECT_EQ(errorOf([] { CInt(Variant(VbArray<Variant>(0, 0))); }), 13);
    EXPECT_EQ(errorOf([] { CLng(Variant(std::make_shared<Object>())); }), 13);
}

// ---- Text read as a number -----------------------------------------------------------

TEST(NumericText, DecimalFormsTheLanguageAccepts) {
    EXPECT_EQ(CInt("12"), 12);
    EXPECT_EQ(CInt(" 12 "), 12);
    EXPECT_EQ(CInt("\t12"), 12);
    EXPECT_EQ(CInt("+12"), 12);
    EXPECT_EQ(CInt("1,000"), 1000);
    EXPECT_EQ(CLng("1,234,567"), 1234567);
    EXPECT_EQ(CInt("1e3"), 1000);
    EXPECT_EQ(CInt("1E+3"), 1000);
    EXPECT_EQ(CInt("15D-1"), 2);  // 1.5, to even
    EXPECT_EQ(CInt("-3.5"), -4);
    EXPECT_EQ(CInt("2.5"), 2);
    EXPECT_EQ(CInt(".5"), 0);
    EXPECT_EQ(CInt("7."), 7);
    EXPECT_EQ(CDbl("-0.25"), -0.25);
}

TEST(NumericText, HexAndOctalAreSixteenBitWhenTheyFit) {
    EXPECT_EQ(CInt("&HFF"), 255);
    EXPECT_EQ(CInt("&hff"), 255);
    EXPECT_EQ(CInt("&HFFFF"), -1);
    EXPECT_EQ(CInt("&H8000"), -32768);
    EXPECT_EQ(CLng("&HFFFF"), -1);
    EXPECT_EQ(CLng("&H10000"), 65536);
    EXPECT_EQ(CLng("&HFFFFFFFF"), -1);
    EXPECT_EQ(CLng("&H7FFFFFFF"), INT32_MAX);
    EXPECT_EQ(errorOf([] { CInt("&H10000"); }), 6);
    EXPECT_EQ(errorOf([] { CLng("&H100000000"); }), 6);
    EXPECT_EQ(CInt("&O17"), 15);
    EXPECT_EQ(CInt("&O177777"), -1);
    EXPECT_EQ(CInt(" &H1F "), 31);
}

TEST(NumericText, AnythingElseIsTypeMismatch) {
    for (const char* text : {"abc", "", "   ", "12abc", "True", "1e", "1e+", "&H", "&HFG", "&O8",
                             "--1", "1.2.3", ".", ",1", "1,", "1 2", "- 1", "&12", "1.5,0"}) {
        EXPECT_EQ(errorOf([&] { CInt(text); }), 13) << '"' << text << '"';
        EXPECT_FALSE(ParseNumber(text).has_value()) << '"' << text << '"';
    }
}

TEST(NumericText, MagnitudeBeyondDoubleOverflowsTinyBecomesZero) {
    EXPECT_EQ(errorOf([] { CDbl("1e400"); }), 6);
    EXPECT_EQ(errorOf([] { CDbl("-123456e999999999"); }), 6);
    EXPECT_EQ(CDbl("1e-400"), 0.0);
    EXPECT_EQ(CDbl("0.000001e-330"), 0.0);
    EXPECT_FALSE(IsNumeric("1e400"));
}

TEST(NumericText, IsNumericFollowsTheSameReading) {
    EXPECT_TRUE(IsNumeric(Variant()));
    EXPECT_TRUE(IsNumeric(true));
    EXPECT_TRUE(IsNumeric(2.5f));
    EXPECT_TRUE(IsNumeric(" 1,000.5 "));
    EXPECT_TRUE(IsNumeric("&HFFFF"));
    EXPECT_FALSE(IsNumeric(kNull));
    EXPECT_FALSE(IsNumeric(""));
    EXPECT_FALSE(IsNumeric("True"));
    EXPECT_FALSE(IsNumeric(Variant(VbArray<Variant>(0, 0))));
    EXPECT_EQ(ParseNumber(" -1.5E2 "), -150.0);
}

// ---- Single and Double ----------------------------------------------------------------

TEST(FloatingConversion, SingleRangeIsChecked) {
    EXPECT_EQ(CSng(0.1), 0.1f);
    EXPECT_EQ(CSng(3.4028234663852886e38), std::numeric_limits<float>::max());
    EXPECT_EQ(errorOf([] { CSng(1e39); }), 6);
    EXPECT_EQ(errorOf([] { CSng(-1e39); }), 6);
    EXPECT_EQ(errorOf([] { CSng("1e39"); }), 6);
    EXPECT_EQ(errorOf([] { CSng(kNaN); }), 6);
    EXPECT_EQ(CSng(1e-50), 0.0f);
    EXPECT_EQ(CSng(true), -1.0f);
    EXPECT_EQ(errorOf([] { CSng(kNull); }), 94);
}

TEST(FloatingConversion, DoubleFromTextAndOtherKinds) {
    EXPECT_EQ(CDbl("1,234.5"), 1234.5);
    EXPECT_EQ(CDbl("2.5E-3"), 0.0025);
    EXPECT_EQ(CDbl(0.1f), static_cast<double>(0.1f));
    EXPECT_EQ(CDbl(Variant()), 0.0);
    EXPECT_EQ(CDbl(int16_t{-7}), -7.0);
    EXPECT_EQ(errorOf([] { CDbl("x"); }), 13);
    EXPECT_EQ(errorOf([] { CDbl(kNull); }), 94);
    EXPECT_EQ(errorOf([] { CDbl(kInf); }), 6);
}

// ---- CStr -----------------------------------------------------------------------------

TEST(TextConversion, SimpleKinds) {
    EXPECT_EQ(CStr(Variant()), "");
    EXPECT_EQ(errorOf([] { CStr(kNull); }), 94);
    EXPECT_EQ(CStr(true), "True");
    EXPECT_EQ(CStr(false), "False");
    EXPECT_EQ(CStr(int16_t{-32768}), "-32768");
    EXPECT_EQ(CStr(INT32_MIN), "-2147483648");
    EXPECT_EQ(CStr("as is "), "as is ");
    EXPECT_EQ(errorOf([] { CStr(Variant(VbArray<Variant>(0, 0))); }), 13);
    EXPECT_EQ(errorOf([] { CStr(Variant(std::make_shared<Object>())); }), 13);
}

TEST(TextConversion, DoubleShowsAtMostFifteenDigits) {
    EXPECT_EQ(CStr(12.5), "12.5");
    EXPECT_EQ(CStr(0.1), "0.1");
    EXPECT_EQ(CStr(0.1 + 0.2), "0.3");
    EXPECT_EQ(CStr(100.0), "100");
    EXPECT_EQ(CStr(-1.5), "-1.5");
    EXPECT_EQ(CStr(1e20), "1E+20");
    EXPECT_EQ(CStr(1e100), "1E+100");
    EXPECT_EQ(CStr(0.0001), "0.0001");
    EXPECT_EQ(CStr(0.00001), "1E-05");
    EXPECT_EQ(CStr(-1.5e-7), "-1.5E-07");
    EXPECT_EQ(CStr(123456789012345.0), "123456789012345");
    EXPECT_EQ(CStr(1e15), "1E+15");
    EXPECT_EQ(CStr(1234567890123456.0), "1.23456789012346E+15");
    EXPECT_EQ(CStr(-0.0), "0");
}

TEST(TextConversion, SingleShowsAtMostSevenDigits) {
    EXPECT_EQ(CStr(CSng(0.1)), "0.1");
    EXPECT_EQ(CStr(3.14159274f), "3.141593");
    EXPECT_EQ(CStr(12.35f), "12.35");
    EXPECT_EQ(CStr(1234567.0f), "1234567");
    EXPECT_EQ(CStr(1e7f), "1E+07");
    EXPECT_EQ(CStr(0.00001f), "1E-05");
    EXPECT_EQ(CStr(-0.0f), "0");
    // The same value as a Double shows its extra digits.
    EXPECT_EQ(CStr(static_cast<double>(0.1f)), "0.100000001490116");
}

TEST(TextConversion, RoundTripsThroughCDbl) {
    for (double d : {0.1, 12.5, 1e20, 1e-5, -1234.5678, 123456789012345.0})
        EXPECT_EQ(CDbl(CStr(d)), d) << d;
}

// ---- CBool ----------------------------------------------------------------------------

TEST(BooleanConversion, NumbersAndWords) {
    EXPECT_TRUE(CBool(int16_t{2}));
    EXPECT_TRUE(CBool(-0.5));
    EXPECT_TRUE(CBool(0.0001f));
    EXPECT_FALSE(CBool(0.0));
    EXPECT_FALSE(CBool(Variant()));
    EXPECT_TRUE(CBool("True"));
    EXPECT_TRUE(CBool("tRUE"));
    EXPECT_FALSE(CBool("false"));
    EXPECT_FALSE(CBool("FALSE"));
    EXPECT_FALSE(CBool("0"));
    EXPECT_TRUE(CBool("2"));
    EXPECT_TRUE(CBool("-1"));
    EXPECT_FALSE(CBool("0.0"));
    EXPECT_EQ(errorOf([] { CBool("yes"); }), 13);
    EXPECT_EQ(errorOf([] { CBool(""); }), 13);
    EXPECT_EQ(errorOf([] { CBool("Truex"); }), 13);
    EXPECT_EQ(errorOf([] { CBool(kNull); }), 94);
}

// ---- Compare --------------------------------------------------------------------------

TEST(VariantComparison, NumbersByValueAcrossKinds) {
    EXPECT_EQ(Compare(int16_t{1}, 1.0), Ordering::Equal);
    EXPECT_EQ(Compare(int32_t{2}, 1.5f), Ordering::Greater);
    EXPECT_EQ(Compare(-1.0, 0.5), Ordering::Less);
    EXPECT_EQ(Compare(true, int16_t{-1}), Ordering::Equal);
    EXPECT_EQ(Compare(true, false), Ordering::Less);  // True is -1
    EXPECT_EQ(Compare(false, 0.0), Ordering::Equal);
    // A Single is compared at its own precision widened, not rounded to the Double.
    EXPECT_NE(Compare(0.1f, 0.1), Ordering::Equal);
}

TEST(VariantComparison, TextByBytes) {
    EXPECT_EQ(Compare("abc", "abc"), Ordering::Equal);
    EXPECT_EQ(Compare("abc", "abd"), Ordering::Less);
    EXPECT_EQ(Compare("a", "B"), Ordering::Greater);  // binary: lower case sorts after
    EXPECT_EQ(Compare("ab", "abc"), Ordering::Less);
    EXPECT_EQ(Compare("10", "9"), Ordering::Less);       // text, not numbers
    EXPECT_EQ(Compare("\xE9", "z"), Ordering::Greater);  // Latin-1 bytes are unsigned
}

TEST(VariantComparison, NumberIsBelowAnyText) {
    EXPECT_EQ(Compare(int32_t{5}, "5"), Ordering::Less);
    EXPECT_EQ(Compare("", 1e300), Ordering::Greater);
    EXPECT_EQ(Compare(true, "True"), Ordering::Less);
}

TEST(VariantComparison, EmptyTakesTheOtherSidesKind) {
    EXPECT_EQ(Compare(Variant(), Variant()), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), int16_t{0}), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), -1.0), Ordering::Greater);
    EXPECT_EQ(Compare(2.0, Variant()), Ordering::Greater);
    EXPECT_EQ(Compare(Variant(), ""), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), "a"), Ordering::Less);
    EXPECT_EQ(Compare("0", Variant()), Ordering::Greater);
    EXPECT_EQ(Compare(false, Variant()), Ordering::Equal);
}

TEST(VariantComparison, NullOnEitherSideIsNull) {
    EXPECT_EQ(Compare(kNull, kNull), Ordering::Null);
    EXPECT_EQ(Compare(kNull, 1.0), Ordering::Null);
    EXPECT_EQ(Compare("a", kNull), Ordering::Null);
    EXPECT_EQ(Compare(Variant(), kNull), Ordering::Null);
}

TEST(VariantComparison, ArraysAndObjectsAreTypeMismatch) {
    EXPECT_EQ(errorOf([] { Compare(Variant(VbArray<Variant>(0, 0)), 1.0); }), 13);
    EXPECT_EQ(errorOf([] { Compare("a", Variant(std::make_shared<Object>())); }), 13);
}

}  // namespace
}  // namespace maroset
