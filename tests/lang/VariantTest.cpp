#include "lang/Variant.h"

#include <gtest/gtest.h>

#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

class Thing : public Object {};

TEST(VariantKinds, EachConstructorGivesItsKindAndTypeName) {
    using enum VarType;
    const Variant array(VbArray<Variant>(1, 2)), object(std::make_shared<Thing>());
    const std::tuple<Variant, VarType, const char*> rows[] = {
        {Variant(), Empty, "Empty"},      {Variant::Null(), Null, "Null"},
        {int16_t{1}, Integer, "Integer"}, {1, Long, "Long"},
        {1.0f, Single, "Single"},         {1.0, Double, "Double"},
        {"1", String, "String"},          {true, Boolean, "Boolean"},
        {array, Array, "Variant()"},      {object, Object, "Object"},
    };
    for (const auto& [v, type, name] : rows) {
        EXPECT_EQ(v.type(), type) << name;
        EXPECT_EQ(v.typeName(), name);
    }
    EXPECT_TRUE(Variant(std::shared_ptr<Thing>()).isObject());  // Nothing is an object too
}

TEST(VariantKinds, AccessorOfAnotherKindIsTypeMismatchEvenWhenConvertible) {
    EXPECT_EQ(errorOf([] { Variant(int16_t{5}).lng(); }), 13);
    EXPECT_EQ(errorOf([] { Variant("5").integer(); }), 13);
    EXPECT_EQ(errorOf([] { Variant(5.0).single(); }), 13);
    EXPECT_EQ(errorOf([] { Variant().string(); }), 13);
    EXPECT_EQ(errorOf([] { Variant("x").array(); }), 13);
}

TEST(VariantArrays, CopiesShareUntilOneIsChanged) {
    auto at = [](const Variant& v, int32_t i) { return v.array()(i); };
    VbArray<Variant> items(1, 2);
    items(1) = Variant("a");
    Variant original(items);
    Variant copy = original;
    copy.array()(1) = Variant("b");
    original.array()(2) = Variant(9);  // changing the other side afterwards must not leak back
    EXPECT_EQ(at(original, 1), Variant("a"));
    EXPECT_EQ(at(copy, 1), Variant("b"));
    EXPECT_EQ(at(copy, 2), Variant());
    VbArray<Variant>& first = original.array();  // no longer shared: changed in place
    EXPECT_EQ(&original.array(), &first);
}

// Tests rely on this identity, so a Single must never equal a Double and so on.
TEST(VariantEquality, SameKindAndValueArraysByElementObjectsByIdentity) {
    EXPECT_NE(Variant(), Variant::Null());
    EXPECT_NE(Variant(int16_t{1}), Variant(1));
    EXPECT_NE(Variant(1.0f), Variant(1.0));
    VbArray<Variant> a(1, 2), b(1, 2);
    a(1) = b(1) = Variant("x");
    EXPECT_EQ(Variant(a), Variant(b));
    b(2) = Variant(0);
    EXPECT_NE(Variant(a), Variant(b));
    EXPECT_NE(Variant(VbArray<Variant>(0, 1)), Variant(VbArray<Variant>(1, 2)));
    const std::shared_ptr<Object> thing = std::make_shared<Thing>();
    EXPECT_EQ(Variant(thing), Variant(thing));
    EXPECT_NE(Variant(thing), Variant(std::shared_ptr<Object>(std::make_shared<Thing>())));
}

}  // namespace
}  // namespace maroset
