#include "lang/VbError.h"

#include <gtest/gtest.h>

namespace maroset {
namespace {

// 5, 91 and 457 are checked word for word by the command's session tests.
TEST(VbErrorDescriptions, StandardNumbersHaveTheLanguagesTexts) {
    const std::pair<int32_t, const char*> rows[] = {
        {6, "Overflow"},
        {9, "Subscript out of range"},
        {13, "Type mismatch"},
        {94, "Invalid use of Null"},
        {438, "Object doesn't support this property or method"},
        {3021, "No current record."},
        {3265, "Item not found in this collection."},
        {3078,
         "The Microsoft Jet database engine cannot find the input table or query. Make sure it "
         "exists and that its name is spelled correctly."},
        {3343, "Unrecognized database format."},
    };
    for (const auto& [number, text] : rows) EXPECT_EQ(ErrorDescription(number), text) << number;
    for (int32_t unknown : {0, 1004, -1})
        EXPECT_EQ(ErrorDescription(unknown), "Application-defined or object-defined error");
    // A description given replaces the standard one.
    EXPECT_EQ(VbError(err::SubscriptOutOfRange).description(), "Subscript out of range");
    const VbError given(err::TypeMismatch, "Bad tag", "node");
    EXPECT_STREQ(given.what(), "Bad tag");
    EXPECT_EQ(given.source(), "node");
}

}  // namespace
}  // namespace maroset
