#include "core/Variant.h"

#include <gtest/gtest.h>

#include <sstream>
#include "support/ErrorOf.h"

namespace maroset {
namespace {

using test::errorOf;

class Thing : public Object {};

TEST(VariantKinds, EachConstructorGivesItsKindAndTypeName) {
    struct Case {
        Variant v;
        VarType type;
        const char* name;
    };
    const Case cases[] = {
        {Variant(), VarType::Empty, "Empty"},
        {Variant::Null(), VarType::Null, "Null"},
        {Variant(int16_t{1}), VarType::Integer, "Integer"},
        {Variant(int32_t{1}), VarType::Long, "Long"},
        {Variant(1.0f), VarType::Single, "Single"},
        {Variant(1.0), VarType::Double, "Double"},
        {Variant("a"), VarType::String, "String"},
        {Variant(std::string_view("a")), VarType::String, "String"},
        {Variant(true), VarType::Boolean, "Boolean"},
        {Variant(VbArray<Variant>(1, 2)), VarType::Array, "Variant()"},
        {Variant(std::make_shared<Thing>()), VarType::Object, "Object"},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(c.v.type(), c.type) << c.name;
        EXPECT_EQ(c.v.typeName(), c.name);
    }
}

TEST(VariantKinds, PredicatesSeparateNumbersFromTheRest) {
    EXPECT_TRUE(Variant(true).isNumber());
    EXPECT_TRUE(Variant(int16_t{0}).isNumber());
    EXPECT_TRUE(Variant(0.5f).isNumber());
    EXPECT_FALSE(Variant("1").isNumber());
    EXPECT_FALSE(Variant().isNumber());
    EXPECT_FALSE(Variant::Null().isNumber());
    EXPECT_TRUE(Variant().isEmpty());
    EXPECT_FALSE(Variant::Null().isEmpty());
    EXPECT_TRUE(Variant::Null().isNull());
    EXPECT_TRUE(Variant(VbArray<Variant>()).isArray());
    EXPECT_FALSE(Variant("x").isArray());
    EXPECT_TRUE(Variant(std::shared_ptr<Object>()).isObject());  // Nothing is an object too
}

TEST(VariantAccessors, WrongKindIsTypeMismatchEvenWhenConvertible) {
    const Variant i(int16_t{5});
    EXPECT_EQ(i.integer(), 5);
    EXPECT_EQ(errorOf([&] { i.lng(); }), 13);
    EXPECT_EQ(errorOf([&] { i.dbl(); }), 13);
    const Variant text("5");
    EXPECT_EQ(errorOf([&] { text.integer(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant(5.0).single(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant(5.0f).dbl(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant(1).boolean(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant().string(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant::Null().string(); }), 13);
    EXPECT_EQ(errorOf([&] { Variant("x").object(); }), 13);
    const Variant constText("x");
    EXPECT_EQ(errorOf([&] { constText.array(); }), 13);
    Variant mutableText("x");
    EXPECT_EQ(errorOf([&] { mutableText.array(); }), 13);
}

TEST(VariantArrays, CopiesShareUntilOneIsChanged) {
    VbArray<Variant> items(1, 2);
    items(1) = Variant("a");
    Variant original(items);
    Variant copy = original;
    copy.array()(1) = Variant("b");
    EXPECT_EQ(std::as_const(original).array()(1), Variant("a"));
    EXPECT_EQ(std::as_const(copy).array()(1), Variant("b"));

    // The other side changing afterwards must not leak back either.
    original.array()(2) = Variant(int32_t{9});
    EXPECT_EQ(std::as_const(copy).array()(2), Variant());
}

TEST(VariantArrays, ReDimThroughACopyLeavesTheOriginal) {
    Variant original(VbArray<Variant>(1, 3));
    Variant copy = original;
    copy.array().ReDimPreserve(5);
    EXPECT_EQ(std::as_const(original).array().UBound(), 3);
    EXPECT_EQ(std::as_const(copy).array().UBound(), 5);
}

TEST(VariantArrays, UnsharedArrayIsChangedInPlace) {
    Variant v(VbArray<Variant>(0, 0));
    VbArray<Variant>& first = v.array();
    first(0) = Variant(true);
    EXPECT_EQ(&v.array(), &first);
    EXPECT_EQ(std::as_const(v).array()(0), Variant(true));
}

TEST(VariantEquality, SameKindAndValueOnly) {
    EXPECT_EQ(Variant(), Variant());
    EXPECT_EQ(Variant::Null(), Variant::Null());
    EXPECT_NE(Variant(), Variant::Null());
    EXPECT_NE(Variant(int16_t{1}), Variant(int32_t{1}));
    EXPECT_NE(Variant(1.0f), Variant(1.0));
    EXPECT_NE(Variant("1"), Variant(int32_t{1}));
    EXPECT_EQ(Variant("ab"), Variant(std::string("ab")));
    EXPECT_NE(Variant(true), Variant(false));
}

TEST(VariantEquality, ArraysCompareElementsAndBoundsObjectsCompareIdentity) {
    VbArray<Variant> a(1, 2), b(1, 2);
    a(1) = b(1) = Variant("x");
    EXPECT_EQ(Variant(a), Variant(b));
    b(2) = Variant(int32_t{0});
    EXPECT_NE(Variant(a), Variant(b));
    EXPECT_NE(Variant(VbArray<Variant>(0, 1)), Variant(VbArray<Variant>(1, 2)));

    auto thing = std::make_shared<Thing>();
    EXPECT_EQ(Variant(std::shared_ptr<Object>(thing)), Variant(std::shared_ptr<Object>(thing)));
    EXPECT_NE(Variant(std::shared_ptr<Object>(thing)),
              Variant(std::shared_ptr<Object>(std::make_shared<Thing>())));
}

TEST(VariantObjects, DefaultValueOfAPlainObjectIsEmpty) {
    Thing t;
    EXPECT_TRUE(t.defaultValue().isEmpty());
}

TEST(VariantPrinting, ShowsKindAndValue) {
    auto print = [](const Variant& v) {
        std::ostringstream os;
        PrintTo(v, &os);
        return os.str();
    };
    EXPECT_EQ(print(Variant()), "Empty");
    EXPECT_EQ(print(Variant(int16_t{-3})), "Integer(-3)");
    EXPECT_EQ(print(Variant(2.5)), "Double(2.5)");
    EXPECT_EQ(print(Variant("a\"\x02")), "String(\"a\\\"\\x02\")");
    VbArray<Variant> items(1, 2);
    items(1) = Variant(true);
    EXPECT_EQ(print(Variant(items)), "Variant()(1 To 2: Boolean(True), Empty)");
}

}  // namespace
}  // namespace maroset
