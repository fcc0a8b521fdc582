#include "core/Conversions.h"

#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

const Variant kNull = Variant::Null();
const Variant kArray = Variant(VbArray<Variant>(0, 0));
const Variant kObject = Variant(std::make_shared<Object>());
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

struct Expect {
    Variant in;
    double out;
};
struct Fails {
    Variant in;
    int32_t error;
};

void check(const char* name, const std::function<double(const Variant&)>& convert,
           std::initializer_list<Expect> ok, std::initializer_list<Fails> bad) {
    for (const auto& c : ok) {
        SCOPED_TRACE(::testing::PrintToString(c.in));
        double got = 0;
        EXPECT_EQ(errorOf([&] { got = convert(c.in); }), 0) << name;
        EXPECT_EQ(got, c.out) << name;
    }
    for (const auto& c : bad)
        EXPECT_EQ(errorOf([&] { convert(c.in); }), c.error)
            << name << ' ' << ::testing::PrintToString(c.in);
}

TEST(IntegerConversion, BankersRoundingAndSixteenBitLimits) {
    check("CInt", [](const Variant& v) { return CInt(v); },
          {{2.5, 2},
           {3.5, 4},
           {-2.5, -2},
           {-3.5, -4},
           {0.5, 0},
           {1.5, 2},
           {-0.5, 0},
           {2.5000001, 3},
           {-1.6, -2},
           {2.5f, 2},
           {32767.4, 32767},
           {-32768.5, -32768},
           {int32_t{-32768}, -32768},
           {true, -1},
           {false, 0},
           {Variant(), 0}},
          {{32767.5, 6},
           {-32769.0, 6},
           {int32_t{32768}, 6},
           {1e300, 6},
           {kNaN, 6},
           {kInf, 6},
           {std::numeric_limits<float>::quiet_NaN(), 6},
           {kNull, 94},
           {kArray, 13},
           {kObject, 13}});
}

TEST(IntegerConversion, ThirtyTwoBitLimitsForLong) {
    check("CLng", [](const Variant& v) { return CLng(v); },
          {{2147483647.0, 2147483647},
           {-2147483648.5, -2147483648.0},
           {1000001.5, 1000002},
           {int16_t{-5}, -5},
           {true, -1},
           {Variant(), 0}},
          {{2147483647.5, 6}, {-2147483649.0, 6}, {3e9f, 6}, {-kInf, 6}, {kNull, 94}});
}

TEST(NumericText, FormsTheLanguageReads) {
    check("CInt", [](const Variant& v) { return CInt(v); },
          {{"12", 12},
           {" 12 ", 12},
           {"\t12", 12},
           {"+12", 12},
           {"1,000", 1000},
           {"1e3", 1000},
           {"1E+3", 1000},
           {"15D-1", 2},
           {"-3.5", -4},
           {"2.5", 2},
           {".5", 0},
           {"7.", 7}},
          {});
    check("CLng", [](const Variant& v) { return CLng(v); }, {{"1,234,567", 1234567}}, {});
}

TEST(NumericText, HexAndOctalAreSixteenBitWhenTheyFit) {
    check("CInt", [](const Variant& v) { return CInt(v); },
          {{"&HFF", 255},
           {"&hff", 255},
           {"&HFFFF", -1},
           {"&H8000", -32768},
           {"&O17", 15},
           {"&O177777", -1},
           {" &H1F ", 31}},
          {{"&H10000", 6}});
    check("CLng", [](const Variant& v) { return CLng(v); },
          {{"&HFFFF", -1}, {"&H10000", 65536}, {"&HFFFFFFFF", -1}, {"&H7FFFFFFF", INT32_MAX}},
          {{"&H100000000", 6}});
}

TEST(NumericText, AnythingElseIsTypeMismatch) {
    for (const char* text : {"abc", "", "   ", "12abc", "True", "1e", "1e+", "&H", "&HFG", "&O8",
                             "--1", "1.2.3", ".", ",1", "1,", "1 2", "- 1", "&12", "1.5,0"}) {
        EXPECT_EQ(errorOf([&] { CInt(text); }), 13) << '"' << text << '"';
        EXPECT_FALSE(IsNumeric(text)) << '"' << text << '"';
    }
}

TEST(NumericText, MagnitudeBeyondDoubleOverflowsTinyBecomesZero) {
    check("CDbl", [](const Variant& v) { return CDbl(v); },
          {{"1e-400", 0.0}, {"0.000001e-330", 0.0}, {"1,234.5", 1234.5}, {"2.5E-3", 0.0025}},
          {{"1e400", 6}, {"-123456e999999999", 6}, {"x", 13}, {kNull, 94}, {kInf, 6}});
    EXPECT_GT(*ParseNumber("1e-310"), 0.0);  // subnormal, still a number
    EXPECT_FALSE(IsNumeric("1e400"));
}

TEST(NumericText, IsNumericOfOtherKinds) {
    EXPECT_TRUE(IsNumeric(Variant()));
    EXPECT_TRUE(IsNumeric(true));
    EXPECT_TRUE(IsNumeric(" 1,000.5 "));
    EXPECT_FALSE(IsNumeric(kNull));
    EXPECT_FALSE(IsNumeric(kArray));
}

TEST(FloatingConversion, SingleRangeIsChecked) {
    check("CSng", [](const Variant& v) { return CSng(v); },
          {{0.1, 0.1f},
           {3.4028234663852886e38, std::numeric_limits<float>::max()},
           {1e-50, 0.0},
           {true, -1.0}},
          {{1e39, 6}, {-1e39, 6}, {"1e39", 6}, {kNaN, 6}, {kNull, 94}});
}

TEST(TextConversion, SimpleKinds) {
    EXPECT_EQ(CStr(Variant()), "");
    EXPECT_EQ(CStr(true), "True");
    EXPECT_EQ(CStr(false), "False");
    EXPECT_EQ(CStr(int16_t{-32768}), "-32768");
    EXPECT_EQ(CStr(INT32_MIN), "-2147483648");
    EXPECT_EQ(errorOf([] { CStr(kNull); }), 94);
    EXPECT_EQ(errorOf([] { CStr(kArray); }), 13);
    EXPECT_EQ(errorOf([] { CStr(kObject); }), 13);
}

TEST(TextConversion, DoubleShowsAtMostFifteenDigits) {
    const std::pair<double, const char*> cases[] = {
        {12.5, "12.5"},
        {0.1 + 0.2, "0.3"},
        {100.0, "100"},
        {1e20, "1E+20"},
        {1e100, "1E+100"},
        {0.0001, "0.0001"},
        {0.00001, "1E-05"},
        {-1.5e-7, "-1.5E-07"},
        {123456789012345.0, "123456789012345"},
        {1e15, "1E+15"},
        {1234567890123456.0, "1.23456789012346E+15"},
        {-0.0, "0"},
        {static_cast<double>(0.1f), "0.100000001490116"},
    };
    for (const auto& [d, text] : cases) EXPECT_EQ(CStr(d), text);
}

TEST(TextConversion, SingleShowsAtMostSevenDigits) {
    const std::pair<float, const char*> cases[] = {
        {0.1f, "0.1"},   {3.14159274f, "3.141593"}, {12.35f, "12.35"}, {1234567.0f, "1234567"},
        {1e7f, "1E+07"}, {0.00001f, "1E-05"},       {-0.0f, "0"},
    };
    for (const auto& [f, text] : cases) EXPECT_EQ(CStr(f), text);
}

TEST(BooleanConversion, NumbersAndWords) {
    check("CBool", [](const Variant& v) { return CBool(v) ? 1.0 : 0.0; },
          {{int16_t{2}, 1},
           {-0.5, 1},
           {0.0001f, 1},
           {0.0, 0},
           {Variant(), 0},
           {"True", 1},
           {"tRUE", 1},
           {"false", 0},
           {"0", 0},
           {"2", 1},
           {"0.0", 0}},
          {{"yes", 13}, {"", 13}, {"Truex", 13}, {kNull, 94}});
}

TEST(VariantComparison, NumbersByValueTextByBytes) {
    EXPECT_EQ(Compare(int16_t{1}, 1.0), Ordering::Equal);
    EXPECT_EQ(Compare(int32_t{2}, 1.5f), Ordering::Greater);
    EXPECT_EQ(Compare(true, int16_t{-1}), Ordering::Equal);
    EXPECT_EQ(Compare(true, false), Ordering::Less);  // True is -1
    EXPECT_NE(Compare(0.1f, 0.1), Ordering::Equal);   // the Single is widened, not rounded
    EXPECT_EQ(Compare("abc", "abd"), Ordering::Less);
    EXPECT_EQ(Compare("a", "B"), Ordering::Greater);  // binary compare
    EXPECT_EQ(Compare("ab", "abc"), Ordering::Less);
    EXPECT_EQ(Compare("10", "9"), Ordering::Less);
    EXPECT_EQ(Compare("\xE9", "z"), Ordering::Greater);  // Latin-1 bytes are unsigned
}

TEST(VariantComparison, MixedKindsEmptyAndNull) {
    EXPECT_EQ(Compare(int32_t{5}, "5"), Ordering::Less);  // a number is below any text
    EXPECT_EQ(Compare("", 1e300), Ordering::Greater);
    EXPECT_EQ(Compare(Variant(), Variant()), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), int16_t{0}), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), -1.0), Ordering::Greater);
    EXPECT_EQ(Compare(Variant(), ""), Ordering::Equal);
    EXPECT_EQ(Compare(Variant(), "a"), Ordering::Less);
    EXPECT_EQ(Compare(false, Variant()), Ordering::Equal);
    EXPECT_EQ(Compare(kNull, kNull), Ordering::Null);
    EXPECT_EQ(Compare("a", kNull), Ordering::Null);
    EXPECT_EQ(Compare(Variant(), kNull), Ordering::Null);
    EXPECT_EQ(errorOf([] { Compare(kArray, 1.0); }), 13);
    EXPECT_EQ(errorOf([] { Compare("a", kObject); }), 13);
}

}  // namespace
}  // namespace maroset
