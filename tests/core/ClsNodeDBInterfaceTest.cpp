#include "core/ClsNodeDBInterface.h"

#include <gtest/gtest.h>

#include <memory>

#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "drivers/local/ClsDriverMemTag.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

class HostFacadeTest : public test::RuntimeFixture {
  protected:
    ClsDriverMemTag reporter;  // the driver the reports below come from
};

TEST_F(HostFacadeTest, EveryFacadeSharesTheOneNodeDBAndSeesEveryEvent) {
    test::HostRecorder first;
    test::HostRecorder second;
    EXPECT_EQ(first.host.nodeDB(), second.host.nodeDB());
    EXPECT_EQ(first.host.nodeDB(), runtime().nodes());

    first.host.nodeDB()->AddNode("M", "MEMTAG");
    first.host.nodeDB()->getNode("M")->WriteTag("7", 3.5);
    ReportError(reporter, "Test Driver", "ClsTest.Run", "boom");
    for (const auto* rec : {&first, &second}) {
        ASSERT_EQ(rec->changes.size(), 1u);
        EXPECT_EQ(rec->changes[0].handles, std::vector<int32_t>{7});
        EXPECT_EQ(rec->changes[0].values, std::vector<Variant>{Variant(3.5)});
        ASSERT_EQ(rec->errors.size(), 1u);
        EXPECT_EQ(rec->errors[0].message, "boom");
    }
}

TEST_F(HostFacadeTest, HostReceivesTheDriversOwnArrays) {
    test::HostRecorder rec;
    VbArray<int32_t> ids(1, std::vector<int32_t>{4, 5});
    VbArray<Variant> values(1, std::vector<Variant>{Variant(1), Variant("x")});
    auto sub = rec.host.ValueChange.subscribe(
        [&](VbArray<int32_t>& gotIds, int16_t n, VbArray<Variant>& gotValues) {
            EXPECT_EQ(&gotIds, &ids);
            EXPECT_EQ(&gotValues, &values);
            EXPECT_EQ(n, 2);
        });
    ReportValues(reporter, ids, values);
    ASSERT_EQ(rec.changes.size(), 1u);
    EXPECT_EQ(rec.changes[0].handlesLower, 1);
    EXPECT_EQ(rec.changes[0].valuesLower, 1);
}

TEST_F(HostFacadeTest, ReportBeforeAnyFacadeSucceedsAndReleasingAFacadeStopsNothing) {
    EXPECT_NO_THROW(ReportValue(reporter, 1, 2));  // the hidden façade and nodeDB are made now
    runtime().nodes()->AddNode("M", "MEMTAG");
    { test::HostRecorder gone; }
    test::HostRecorder late;
    EXPECT_TRUE(late.changes.empty());
    late.host.nodeDB()->getNode("M")->WriteTag("1", true);
    EXPECT_EQ(late.host.nodeDB()->count(), 1);
    EXPECT_EQ(late.changes.size(), 1u);
}

TEST_F(HostFacadeTest, FacadeReleasedInsideItsOwnHandler) {
    auto doomed = std::make_unique<ClsNodeDBInterface>();
    test::HostRecorder other;
    auto sub = doomed->ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { doomed.reset(); });
    ReportValue(reporter, 1, 1);
    ReportValue(reporter, 2, 2);
    EXPECT_FALSE(doomed);
    EXPECT_EQ(other.changes.size(), 2u);
}

TEST_F(HostFacadeTest, AssigningAnotherNodeDBMovesTheEvents) {
    test::HostRecorder rec;
    auto own = std::make_shared<nodeDB>();
    rec.host.nodeDB(own);
    ReportValue(reporter, 1, 1);  // through the process-wide nodeDB
    EXPECT_TRUE(rec.changes.empty());
    VbArray<int32_t> ids(1, 1);
    VbArray<Variant> values(1, 1);
    own->NewValue(ids, 1, values);
    EXPECT_EQ(rec.changes.size(), 1u);
}

}  // namespace
}  // namespace maroset
