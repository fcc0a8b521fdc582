#include "core/node.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "core/Runtime.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using test::errorOf;

class NodeTest : public test::RuntimeFixture {
  protected:
    std::shared_ptr<node> makeNode(const Variant& driver, const std::string& name = "N1") {
        auto n = std::make_shared<node>();
        n->Name = name;
        n->DriverName = driver;
        return n;
    }
    test::HostRecorder host;
};

TEST_F(NodeTest, TypeKeySelectsDriverInAnyCaseAndFallsBackToMemoryTags) {
    for (const Variant& key : {Variant("memtag"), Variant("MemTag"), Variant("XYZ"), Variant(""),
                               Variant(), Variant(7)}) {
        auto n = makeNode(key);
        n->Init();
        ASSERT_TRUE(n->driver()) << ::testing::PrintToString(key);
        EXPECT_STREQ(n->driver()->className(), "ClsDriverMemTag");
        EXPECT_EQ(n->driver()->NodeName(), "N1");
    }
}

TEST_F(NodeTest, NullTypeKeyFailsInitAndLeavesNoDriver) {
    auto n = makeNode(Variant::Null());
    EXPECT_EQ(errorOf([&] { n->Init(); }), err::InvalidUseOfNull);
    EXPECT_FALSE(n->driver());
}

TEST_F(NodeTest, AddTagInitialisesOnceButInitAgainReplacesTheDriver) {
    auto n = makeNode("MEMTAG");
    n->AddTag(1, "A");
    const auto first = n->driver();
    ASSERT_TRUE(first);
    n->AddTag(2, "B");
    EXPECT_EQ(n->driver(), first);
    n->Init();
    EXPECT_NE(n->driver(), first);
    n->IsActive(true);
    EXPECT_FALSE(n->IsActive());  // the read side never sees the assignment
}

TEST_F(NodeTest, HandleWidths) {
    auto n = makeNode("MEMTAG");
    n->Init();
    EXPECT_NO_THROW(n->AddTag(32767, "A"));
    EXPECT_NO_THROW(n->RemoveTag(-32768));
    for (int32_t handle : {32768, -32769}) {
        EXPECT_EQ(errorOf([&] { n->AddTag(handle, "A"); }), err::Overflow);
        EXPECT_EQ(errorOf([&] { n->RemoveTag(handle); }), err::Overflow);
    }
    n->WriteTag("100000", 1);  // reads and writes carry 32 bits
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{100000});
}

TEST_F(NodeTest, WriteTagConvertsTheHandleTextBeforeTheDriverRuns) {
    auto n = makeNode("MEMTAG");
    n->AddTag(12, "Level");
    EXPECT_EQ(n->WriteTag("12", 3.5), Variant());
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{12});
    for (const char* bad : {"abc", "", "12x"})
        EXPECT_EQ(errorOf([&] { n->WriteTag(bad, 1); }), err::TypeMismatch) << bad;
    EXPECT_EQ(host.changes.size(), 1u);  // the driver never ran
}

TEST_F(NodeTest, OperationsBeforeInitFailWithObjectNotSet) {
    auto n = makeNode("MEMTAG");
    VbArray<Variant> values(0, 0);
    EXPECT_EQ(errorOf([&] { n->RemoveTag(1); }), err::ObjectNotSet);
    EXPECT_EQ(errorOf([&] { n->ReadTag(1); }), err::ObjectNotSet);
    EXPECT_EQ(errorOf([&] { n->WriteTag("1", 1); }), err::ObjectNotSet);
    EXPECT_EQ(errorOf([&] { n->IsActive(true); }), err::ObjectNotSet);
    EXPECT_EQ(errorOf([&] { n->WriteArray("1", values); }), err::ObjectNotSet);
}

TEST_F(NodeTest, TrappedFailuresAreLoggedAndReturnEmptyButIsActiveAssignmentIsNot) {
    runtime().trap().setEnabled(true);
    auto n = makeNode("MEMTAG");
    EXPECT_EQ(errorOf([&] { n->IsActive(true); }), err::ObjectNotSet);
    EXPECT_EQ(errorLogRecords(), 0u);
    n->Init();
    EXPECT_EQ(n->WriteTag("abc", 1), Variant());
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_NE(log.find("Module\\Sub: node.WriteTag 0\r\n"), std::string::npos);
    EXPECT_NE(log.find("Description: Type mismatch\r\n"), std::string::npos);
}

TEST_F(NodeTest, HostMayReleaseTheNodeInsideItsOwnValueChange) {
    auto n = makeNode("MEMTAG");
    n->Init();
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { n.reset(); });
    std::weak_ptr<node> watch = n;
    n->WriteTag("5", 1);
    EXPECT_FALSE(n);
    EXPECT_TRUE(watch.expired());
}

TEST_F(NodeTest, WriteArrayReachesTheDriverButIsNotLoopedBack) {
    auto n = makeNode("MEMTAG");
    n->Init();
    VbArray<Variant> values(0, 2);
    EXPECT_EQ(n->WriteArray("4", values), Variant());
    EXPECT_TRUE(host.changes.empty());
    EXPECT_THROW(n->WriteArray("four", values), VbError);
}

}  // namespace
}  // namespace maroset
