#include "core/VbError.h"

#include <gtest/gtest.h>

namespace maroset {
namespace {

TEST(VbErrorDescriptions, StandardNumbersHaveTheLanguagesTexts) {
    EXPECT_EQ(ErrorDescription(5), "Invalid procedure call or argument");
    EXPECT_EQ(ErrorDescription(6), "Overflow");
    EXPECT_EQ(ErrorDescription(9), "Subscript out of range");
    EXPECT_EQ(ErrorDescription(13), "Type mismatch");
    EXPECT_EQ(ErrorDescription(91), "Object variable or With block variable not set");
    EXPECT_EQ(ErrorDescription(94), "Invalid use of Null");
    EXPECT_EQ(ErrorDescription(438), "Object doesn't support this property or method");
    EXPECT_EQ(ErrorDescription(457),
              "This key is already associated with an element of this collection");
}

TEST(VbErrorDescriptions, DatabaseTextsKeepTheirFullStops) {
    EXPECT_EQ(ErrorDescription(3021), "No current record.");
    EXPECT_EQ(ErrorDescription(3265), "Item not found in this collection.");
    EXPECT_EQ(ErrorDescription(3078),
              "The Microsoft Jet database engine cannot find the input table or query. Make "
              "sure it exists and that its name is spelled correctly.");
    EXPECT_EQ(ErrorDescription(3343), "Unrecognized database format.");
}

TEST(VbErrorDescriptions, UnknownNumberIsApplicationDefined) {
    EXPECT_EQ(ErrorDescription(0), "Application-defined or object-defined error");
    EXPECT_EQ(ErrorDescription(1004), "Application-defined or object-defined error");
    EXPECT_EQ(ErrorDescription(-1), "Application-defined or object-defined error");
}

TEST(VbErrorConstruction, EmptyDescriptionTakesTheStandardOne) {
    const VbError e(err::SubscriptOutOfRange);
    EXPECT_EQ(e.number(), 9);
    EXPECT_EQ(e.description(), "Subscript out of range");
    EXPECT_STREQ(e.what(), "Subscript out of range");
    EXPECT_EQ(e.source(), "");
    EXPECT_EQ(e.line(), 0);
}

TEST(VbErrorConstruction, GivenDescriptionAndSourceAreKept) {
    VbError e(err::TypeMismatch, "Bad tag", "node");
    EXPECT_EQ(e.description(), "Bad tag");
    EXPECT_EQ(e.source(), "node");
    e.setSource("nodeDB");
    EXPECT_EQ(e.source(), "nodeDB");
}

}  // namespace
}  // namespace maroset
