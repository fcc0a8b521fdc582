#include "lang/Conversions.h"

#include <gtest/gtest.h>

#include <cfloat>
#include <cmath>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

const Variant kNull = Variant::Null();
const Variant kArray = Variant(VbArray<Variant>(0, 0));
const Variant kObject = Variant(std::make_shared<Object>());

// A conversion gives `out`, or fails with `error` when that is not 0.
struct Row {
    Variant in;
    double out;
    int32_t error;
};

template <class Convert, size_t N>
void expectConversions(Convert convert, const Row (&rows)[N]) {
    for (const Row& r : rows) {
        const std::string in = ::testing::PrintToString(r.in);
        double got = 0;
        EXPECT_EQ(errorOf([&] { got = convert(r.in); }), r.error) << in;
        if (r.error == 0) EXPECT_EQ(got, r.out) << in;
    }
}

// Text is read in every form the language reads: blanks, sign, thousands separators,
// exponents with E or D, and &H / &O, which stay 16-bit when they fit.
TEST(NumberConversion, IntegersRoundHalfToEvenWithinTheirLimits) {
    const Row ints[] = {
        {2.5, 2},         {3.5, 4},           {-2.5, -2},        {-3.5, -4},
        {0.5, 0},         {1.5, 2},           {2.5000001, 3},    {2.5f, 2},
        {32767.4, 32767}, {-32768.5, -32768}, {true, -1},        {Variant(), 0},
        {32767.5, 0, 6},  {-32769.0, 0, 6},   {32768, 0, 6},     {std::nan(""), 0, 6},
        {HUGE_VAL, 0, 6}, {kNull, 0, 94},     {kArray, 0, 13},   {kObject, 0, 13},
        {" 12 ", 12},     {"\t12", 12},       {"+12", 12},       {"1,000", 1000},
        {"1E+3", 1000},   {"15D-1", 2},       {"-3.5", -4},      {".5", 0},
        {"7.", 7},        {"&hff", 255},      {"&HFFFF", -1},    {"&H8000", -32768},
        {"&O17", 15},     {"&O177777", -1},   {"&H10000", 0, 6},
    };
    expectConversions(CInt, ints);
    for (const Row& r : ints)
        if (r.in.isString()) EXPECT_TRUE(IsNumeric(r.in)) << r.in.string();
    const Row longs[] = {
        {2147483647.0, INT32_MAX},  {2147483647.5, 0, 6},  {"&H7FFFFFFF", INT32_MAX},
        {-2147483648.5, INT32_MIN}, {-2147483649.0, 0, 6}, {"&H100000000", 0, 6},
        {1000001.5, 1000002},       {3e9f, 0, 6},          {"&HFFFFFFFF", -1},
        {"1,234,567", 1234567},     {"&HFFFF", -1},        {"&H10000", 65536},
    };
    expectConversions(CLng, longs);
    const Row bytes[] = {{255, 255},  {2.5, 2},   {"&H89", 137},
                         {256, 0, 6}, {-1, 0, 6}, {"ACC", 0, 13}};
    expectConversions(CByte, bytes);
}

// Beyond a Double overflows; below the smallest becomes zero.
TEST(NumberConversion, SingleDoubleAndBoolean) {
    const Row singles[] = {
        {0.1, 0.1f},  {1e-50, 0},     {3.4028234663852886e38, FLT_MAX},
        {1e39, 0, 6}, {"1e39", 0, 6}, {std::nan(""), 0, 6},
    };
    expectConversions(CSng, singles);
    const Row doubles[] = {
        {"1e-400", 0},   {"0.000001e-330", 0},        {"1,234.5", 1234.5},
        {"1e400", 0, 6}, {"-123456e999999999", 0, 6}, {kNull, 0, 94},
    };
    expectConversions(CDbl, doubles);
    EXPECT_GT(*ParseNumber("1e-310"), 0.0);  // subnormal, still a number
    // Whole numbers take a shorter way than the rest; both must give the same Doubles.
    EXPECT_EQ(*ParseNumber(" 007 "), 7.0);
    EXPECT_TRUE(std::signbit(*ParseNumber("-0")));
    EXPECT_EQ(*ParseNumber("+999999999999999"), 999999999999999.0);
    EXPECT_EQ(*ParseNumber("9007199254740993"), 9007199254740992.0);  // rounded to even
    EXPECT_EQ(*ParseNumber("-12345678901234567890"), -12345678901234567890.0);
    EXPECT_FALSE(ParseNumber("-"));
    EXPECT_FALSE(ParseNumber("12 3"));
    const Row booleans[] = {
        {int16_t{2}, 1}, {-0.5, 1}, {0.0, 0},   {Variant(), 0},   {"tRUE", 1},
        {"false", 0},    {"2", 1},  {"0.0", 0}, {"Truex", 0, 13}, {kNull, 0, 94},
    };
    expectConversions(CBool, booleans);
}

TEST(NumberConversion, AnyOtherTextIsTypeMismatch) {
    for (const char* text : {"abc", "", "   ", "12abc", "True", "1e", "1e+", "&H", "&HFG", "&O8",
                             "--1", "1.2.3", ".", ",1", "1,", "1 2", "- 1", "&12", "1.5,0"}) {
        EXPECT_EQ(errorOf([&] { CInt(text); }), 13) << '"' << text << '"';
        EXPECT_FALSE(IsNumeric(text)) << '"' << text << '"';
    }
    for (const Variant& v : {Variant(), Variant(true)}) EXPECT_TRUE(IsNumeric(v));
    for (const Variant& v : {kNull, kArray, Variant("1e400")}) EXPECT_FALSE(IsNumeric(v));
}

TEST(TextConversion, SingleShowsSevenDigitsDoubleFifteen) {
    const std::pair<Variant, const char*> rows[] = {
        {Variant(), ""},       {true, "True"},          {false, "False"},
        {12.5, "12.5"},        {0.1 + 0.2, "0.3"},      {100.0, "100"},
        {1e100, "1E+100"},     {0.0001, "0.0001"},      {0.00001, "1E-05"},
        {-1.5e-7, "-1.5E-07"}, {1e15, "1E+15"},         {-0.0, "0"},
        {0.1f, "0.1"},         {1e7f, "1E+07"},         {3.14159274f, "3.141593"},
        {-0.0f, "0"},          {1234567.0f, "1234567"}, {int16_t{-32768}, "-32768"},
    };
    for (const auto& [in, text] : rows) EXPECT_EQ(CStr(in), text) << ::testing::PrintToString(in);
    EXPECT_EQ(CStr(INT32_MIN), "-2147483648");
    EXPECT_EQ(CStr(123456789012345.0), "123456789012345");
    EXPECT_EQ(CStr(1234567890123456.0), "1.23456789012346E+15");
    EXPECT_EQ(CStr(double(0.1f)), "0.100000001490116");
    EXPECT_EQ(errorOf([] { CStr(kNull); }), 94);
}

// Numbers compare by value (True is -1, a Single is widened, not rounded) and below any text;
// text compares by its bytes, unsigned; Empty is 0 or ""; Null makes the result Null.
TEST(DateConversion, TheTextFormShowsDateTimeOrBoth) {
    EXPECT_EQ(CStr(Variant::FromDate(45293.0)), "1/2/2024");
    EXPECT_EQ(CStr(Variant::FromDate(45293.5)), "1/2/2024 12:00:00 PM");
    EXPECT_EQ(CStr(Variant::FromDate(45293.0 + 3.0 / 24 + 4.0 / 1440 + 5.0 / 86400)),
              "1/2/2024 3:04:05 AM");
    // Day 0 alone is the time of day; midnight of day 0 is the day.
    EXPECT_EQ(CStr(Variant::FromDate(0.75)), "6:00:00 PM");
    EXPECT_EQ(CStr(Variant::FromDate(0.0)), "12/30/1899");
    // Before day 0 the days count down and the time still counts up.
    EXPECT_EQ(CStr(Variant::FromDate(-1.25)), "12/29/1899 6:00:00 AM");
    // A time that rounds to the next day's midnight shows that day.
    EXPECT_EQ(CStr(Variant::FromDate(45293.9999999)), "1/3/2024");
}

TEST(DateConversion, DatesAreTheirSerialAsNumbersAndTextReadsBack) {
    const Variant d = Variant::FromDate(45293.5);
    EXPECT_EQ(d.type(), VarType::Date);
    EXPECT_EQ(d.typeName(), "Date");
    EXPECT_DOUBLE_EQ(CDbl(d), 45293.5);
    EXPECT_EQ(CLng(d), 45294);  // half to even
    EXPECT_TRUE(CBool(d));
    EXPECT_FALSE(IsNumeric(d));
    EXPECT_EQ(Compare(d, Variant(45293.5)), Ordering::Equal);
    EXPECT_DOUBLE_EQ(CDate(Variant("1/2/2024 12:00:00 PM")), 45293.5);
    EXPECT_DOUBLE_EQ(CDate(Variant("6:00:00 PM")), 0.75);
    EXPECT_DOUBLE_EQ(CDate(Variant(" 12/30/1899 ")), 0.0);
    EXPECT_DOUBLE_EQ(CDate(Variant(10)), 10.0);
    EXPECT_DOUBLE_EQ(CDate(Variant("10.5")), 10.5);
    EXPECT_EQ(errorOf([] { CDate(Variant("13/1/2024")); }), err::TypeMismatch);
    EXPECT_EQ(errorOf([] { CDate(Variant("1/2/2024 13:00:00 PM")); }), err::TypeMismatch);
    EXPECT_EQ(errorOf([] { CDate(Variant(3e6)); }), err::Overflow);
    EXPECT_EQ(errorOf([] { CDate(kNull); }), err::InvalidUseOfNull);
}

TEST(VariantComparison, NumbersByValueTextByBytesEmptyAndNull) {
    using enum Ordering;
    const Variant e;
    const std::tuple<Variant, Variant, Ordering> rows[] = {
        {int16_t{1}, 1.0, Equal}, {2, 1.5f, Greater},     {true, int16_t{-1}, Equal},
        {0.1f, 0.1, Greater},     {"a", "B", Greater},    {"ab", "abc", Less},
        {"10", "9", Less},        {"\xE9", "z", Greater}, {5, "5", Less},
        {"", 1e300, Greater},     {e, e, Equal},          {e, int16_t{0}, Equal},
        {e, -1.0, Greater},       {e, "", Equal},         {e, "a", Less},
        {kNull, kNull, Null},     {"a", kNull, Null},     {e, kNull, Null},
    };
    for (const auto& [a, b, order] : rows)
        EXPECT_EQ(Compare(a, b), order)
            << ::testing::PrintToString(a) << " vs " << ::testing::PrintToString(b);
    EXPECT_EQ(errorOf([] { Compare(kArray, 1.0); }), 13);
}

}  // namespace
}  // namespace maroset
