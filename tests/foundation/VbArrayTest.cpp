#include "core/VbArray.h"

#include <gtest/gtest.h>

#include <climits>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

TEST(VbArrayBounds, OneBasedArrayAcceptsOnlyItsBounds) {
    VbArray<int> a(1, 3);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a.UBound(), 3);
    EXPECT_EQ(a.size(), 3);
    a(1) = 10;
    a(3) = 30;
    EXPECT_EQ(a(1), 10);
    EXPECT_EQ(a(3), 30);
    EXPECT_EQ(errorOf([&] { a(0); }), 9);
    EXPECT_EQ(errorOf([&] { a(4); }), 9);
    const auto& c = a;
    EXPECT_EQ(errorOf([&] { c(0); }), 9);
}

TEST(VbArrayBounds, EmptyArrayHasUpperBoundBelowLower) {
    VbArray<int> none;
    EXPECT_TRUE(none.empty());
    EXPECT_EQ(none.LBound(), 0);
    EXPECT_EQ(none.UBound(), -1);
    EXPECT_EQ(errorOf([&] { none(0); }), 9);

    VbArray<int> oneBasedEmpty(1, 0);
    EXPECT_EQ(oneBasedEmpty.LBound(), 1);
    EXPECT_EQ(oneBasedEmpty.UBound(), 0);
    EXPECT_EQ(errorOf([&] { oneBasedEmpty(1); }), 9);
}

TEST(VbArrayBounds, NegativeAndExtremeIndicesFailCleanly) {
    VbArray<int> a(-2, 2);
    a(-2) = 1;
    EXPECT_EQ(a(-2), 1);
    EXPECT_EQ(errorOf([&] { a(-3); }), 9);
    EXPECT_EQ(errorOf([&] { a(INT32_MIN); }), 9);
    EXPECT_EQ(errorOf([&] { a(INT32_MAX); }), 9);
}

TEST(VbArrayReDim, ResetsEveryElementAndMovesBothBounds) {
    VbArray<int> a(0, 2);
    a(0) = 7;
    a.ReDim(1, 4);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a.UBound(), 4);
    for (int i = 1; i <= 4; ++i) EXPECT_EQ(a(i), 0);
}

TEST(VbArrayReDim, UpperBelowLowerMinusOneFailsAndLeavesArrayUnchanged) {
    VbArray<int> a(1, 2);
    a(1) = 5;
    EXPECT_EQ(errorOf([&] { a.ReDim(5, 3); }), 9);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a.UBound(), 2);
    EXPECT_EQ(a(1), 5);
    EXPECT_EQ(errorOf([&] { a.ReDim(INT32_MAX, INT32_MIN); }), 9);
}

TEST(VbArrayReDim, LowestLowerBoundDoesNotWrapAround) {
    VbArray<int> a;
    a.ReDim(INT32_MIN, INT32_MIN);
    EXPECT_EQ(a.size(), 1);
    a(INT32_MIN) = 4;
    a.ReDimPreserve(INT32_MIN + 1);
    EXPECT_EQ(a.size(), 2);
    EXPECT_EQ(a(INT32_MIN), 4);
}

TEST(VbArrayReDimPreserve, GrowingKeepsElementsAndLowerBound) {
    VbArray<int> a(1, 2);
    a(1) = 1;
    a(2) = 2;
    a.ReDimPreserve(4);
    EXPECT_EQ(a.LBound(), 1);
    EXPECT_EQ(a.UBound(), 4);
    EXPECT_EQ(a(1), 1);
    EXPECT_EQ(a(2), 2);
    EXPECT_EQ(a(4), 0);
}

TEST(VbArrayReDimPreserve, ShrinkingDropsTheTailAndCanEmpty) {
    VbArray<int> a(1, 3);
    a(1) = 1;
    a(3) = 3;
    a.ReDimPreserve(1);
    EXPECT_EQ(a.UBound(), 1);
    EXPECT_EQ(a(1), 1);
    EXPECT_EQ(errorOf([&] { a(2); }), 9);
    a.ReDimPreserve(0);
    EXPECT_TRUE(a.empty());
    EXPECT_EQ(a.UBound(), 0);
    EXPECT_EQ(errorOf([&] { a.ReDimPreserve(-1); }), 9);
    a.ReDimPreserve(1);
    EXPECT_EQ(a(1), 0);  // a slot that came back starts fresh
}

}  // namespace
}  // namespace maroset
