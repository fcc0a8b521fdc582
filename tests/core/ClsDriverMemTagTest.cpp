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

TEST_F(MemTagTest, EverythingElseDoesNothing) {
    EXPECT_FALSE(driver.AddItem("Level", 5));
    VbArray<std::string> names(1, 1);
    VbArray<int32_t> handles(1, 1);
    EXPECT_FALSE(driver.AddItems(1, names, handles));
    EXPECT_EQ(driver.ReadItem(5), 0);
    EXPECT_EQ(driver.ReadAllItems(), 0);
    VbArray<Variant> data(0, 1);
    EXPECT_EQ(driver.WriteArray(5, data), 0);
    int32_t code = 3;
    EXPECT_EQ(driver.GetErrorString(code), "");
    driver.IsActive(true);
    driver.RemoveItem(5);
    driver.PostMessage(code);
    driver.startup("x", "y");
    driver.shutdown();
    EXPECT_TRUE(host.changes.empty());
}

TEST_F(MemTagTest, AcceptsEveryConfigurationProperty) {
    driver.ScanRate(Variant(100));
    driver.OPCTopic(Variant("t"));
    driver.ServerName(Variant("s"));
    driver.SerialPort(Variant(1));
    driver.BaudRate(Variant(9600));
    driver.TagPrefex(Variant("p"));
    driver.IPAddress(Variant("127.0.0.1"));
    driver.Port(Variant(502));
    driver.NodeName("N");
    EXPECT_EQ(driver.ScanRate(), Variant(100));
    EXPECT_EQ(driver.NodeName(), "N");
}

class BareDriver final : public Driver {
  public:
    const char* className() const override { return "BareDriver"; }
};

TEST(DriverContract, MissingMembersFailAsACallByNameWould) {
    BareDriver d;
    int32_t code = 0;
    VbArray<Variant> data;
    for (const auto& call : std::initializer_list<std::function<void()>>{
             [&] { d.shutdown(); }, [&] { d.startup("a", "b"); }, [&] { d.PostMessage(code); },
             [&] { d.IsActive(true); }, [&] { d.WriteItem(1, 1); }, [&] { d.AddItem("a", 1); },
             [&] { d.ReadItem(1); }, [&] { d.WriteArray(1, data); }}) {
        EXPECT_EQ(errorOf([&] { call(); }), err::NotSupported);
    }
}

}  // namespace
}  // namespace maroset
