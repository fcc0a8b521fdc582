#include "lang/VbArray.h"

#include <gtest/gtest.h>

#include <climits>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

constexpr int32_t kMin = INT32_MIN, kMax = INT32_MAX;

TEST(VbArrayBounds, OnlyIndicesWithinTheBoundsAreAccepted) {
    // {lower, upper, index, error on using the index}
    const std::tuple<int32_t, int32_t, int32_t, int32_t> rows[] = {
        {1, 3, 1, 0},     {1, 3, 3, 0},     {1, 3, 0, 9},          {1, 3, 4, 9},
        {1, 0, 1, 9},     {0, -1, 0, 9},    {-2, 2, -2, 0},        {-2, 2, -3, 9},
        {-2, 2, kMin, 9}, {-2, 2, kMax, 9}, {kMin, kMin, kMin, 0},
    };
    for (const auto& [lower, upper, index, error] : rows) {
        SCOPED_TRACE(::testing::Message() << lower << " To " << upper << ", index " << index);
        VbArray<int> a(lower, upper);
        EXPECT_EQ(a.LBound(), lower);
        EXPECT_EQ(a.UBound(), upper);
        EXPECT_EQ(errorOf([&] { a(index) = 7; }), error);
        EXPECT_EQ(errorOf([&] { std::as_const(a)(index); }), error);
    }
    EXPECT_EQ(VbArray<int>().UBound(), -1);  // LBound 0, no elements
}

TEST(VbArrayReDim, ResetsOrPreservesAndFailsLeavingTheArrayAsItWas) {
    VbArray<int> a(0, 2);
    a(0) = 7;
    a.ReDim(1, 4);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a.UBound(), 4);
    for (int i = 1; i <= 4; ++i) EXPECT_EQ(a(i), 0);
    a(1) = 5;
    EXPECT_EQ(errorOf([&] { a.ReDim(5, 3); }), 9);
    EXPECT_EQ(errorOf([&] { a.ReDim(kMax, kMin); }), 9);
    EXPECT_EQ(a.UBound(), 4);
    EXPECT_EQ(a(1), 5);
    // Preserve keeps the lower bound and whatever still fits.
    a(3) = 3;
    a.ReDimPreserve(6);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a(3), 3);
    EXPECT_EQ(a(6), 0);
    a.ReDimPreserve(1);
    EXPECT_EQ(a(1), 5);
    EXPECT_EQ(errorOf([&] { a(2); }), 9);
    a.ReDimPreserve(0);
    EXPECT_TRUE(a.empty());
    EXPECT_EQ(errorOf([&] { a.ReDimPreserve(-1); }), 9);
    a.ReDimPreserve(1);
    EXPECT_EQ(a(1), 0);  // a slot that comes back starts fresh
    VbArray<int> lowest(kMin, kMin);
    lowest.ReDimPreserve(kMin + 1);  // the lowest lower bound does not wrap around
    EXPECT_EQ(lowest.UBound(), kMin + 1);
}

}  // namespace
}  // namespace maroset
