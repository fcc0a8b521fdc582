#include "drivers/local/ClsDriverMemTag.h"

#include <gtest/gtest.h>

#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using test::errorOf;

class MemTagTest : public test::RuntimeFixture {
  protected:
    test::HostRecorder host;
    ClsDriverMemTag driver;
};

TEST_F(MemTagTest, WriteIsReportedBackOnceBeforeWriteItemReturns) {
    bool returned = false;
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { EXPECT_FALSE(returned); });
    EXPECT_EQ(driver.WriteItem(7, 3.5), 0);
    returned = true;
    ASSERT_EQ(host.changes.size(), 1u);
    const auto& c = host.changes[0];
    EXPECT_EQ(c.handles, std::vector<int32_t>{7});
    EXPECT_EQ(c.count, 1);
    EXPECT_EQ(c.values, std::vector<Variant>{Variant(3.5)});
    EXPECT_EQ(c.handlesLower, 1);
    EXPECT_EQ(c.valuesLower, 1);
}

TEST_F(MemTagTest, EverythingElseDoesNothingAndEveryPropertyIsAccepted) {
    EXPECT_FALSE(driver.AddItem("Level", 5));  // although the tag is usable
    EXPECT_EQ(driver.ReadItem(5), 0);
    VbArray<Variant> data(0, 1);
    EXPECT_EQ(driver.WriteArray(5, data), 0);  // arrays are not looped back
    driver.IsActive(true);
    driver.ScanRate(Variant(100));
    driver.TagPrefex(Variant("p"));
    EXPECT_EQ(driver.ScanRate(), Variant(100));
    EXPECT_TRUE(host.changes.empty());
}

class BareDriver final : public Driver {
  public:
    const char* className() const override { return "BareDriver"; }
};

TEST(DriverContract, MissingMembersFailAsACallByNameWould) {
    BareDriver d;
    int32_t code = 0;
    VbArray<Variant> data;
    EXPECT_EQ(errorOf([&] { d.PostMessage(code); }), err::NotSupported);
    EXPECT_EQ(errorOf([&] { d.WriteItem(1, 1); }), err::NotSupported);
    EXPECT_EQ(errorOf([&] { d.WriteArray(1, data); }), err::NotSupported);
    d.OPCTopic(Variant("accepted"));  // properties are always there
    EXPECT_EQ(d.OPCTopic(), Variant("accepted"));
}

}  // namespace
}  // namespace maroset
