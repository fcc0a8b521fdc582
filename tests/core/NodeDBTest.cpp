#include "core/nodeDB.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/Runtime.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"
#include "support/SqlScript.h"

namespace maroset {
namespace {

using test::errorOf;

constexpr const char* kNodesTable =
    "create table Nodes (Name text, Driver text, OPCServer text, OPCTopic text, "
    "UpdateRate integer, CommPort integer, BaudRate integer, TagPrefex text, "
    "IPAddress text, Port integer);";

class NodeDBTest : public test::RuntimeFixture {
  protected:
    nodeDB& db() { return *host.host.nodeDB(); }
    std::string project(const std::string& rows, const std::string& table = kNodesTable) {
        const auto file = driveRoot() / "project.db";
        test::RunSqlScript(file, table + rows);
        return file.string();
    }
    std::vector<std::string> names() {
        std::vector<std::string> result;
        for (const auto& n : db().nodes()) result.push_back(n->Name);
        return result;
    }
    int32_t loadError(const std::string& file) {
        return errorOf([&] { db().AddAllNodes(file); });
    }
    test::HostRecorder host;
};

TEST_F(NodeDBTest, DriverListsAreOneBasedWithTheirExactTexts) {
    const VbArray<Variant> drivers(
        1, {"MEMTAG", "OPC", "NUVABDF1", "DiskTag", "WagoIO", "NUVIntech", "NUVTCPIP"});
    const VbArray<Variant> types(1, {"1", "2", "3", "4", "5", "3", "2"});
    EXPECT_EQ(db().GetDrivers(), Variant(drivers));
    EXPECT_EQ(db().GetDriverType(), Variant(types));
}

TEST_F(NodeDBTest, KeysIgnoreLetterCaseAndUnknownNames) {
    db().AddNode("Line1", "MEMTAG");
    EXPECT_EQ(db().getNode("LINE1"), db().getNode("Line1"));
    EXPECT_EQ(errorOf([&] { db().AddNode("line1", "MEMTAG"); }), err::DuplicateKey);
    EXPECT_EQ(db().count(), 1);
    EXPECT_EQ(errorOf([&] { db().RemoveNode("nope"); }), err::InvalidProcedureCall);
    runtime().trap().setEnabled(true);
    EXPECT_EQ(db().getNode("nope"), nullptr);  // ignored inside, never logged
    EXPECT_EQ(errorLogRecords(), 0u);
}

TEST_F(NodeDBTest, AddNodeFillsItsPropertiesInOrderWithDefaults) {
    db().AddNode("A", "memtag");
    db().AddNode("B", "MEMTAG", "topic", 250, 3);
    const auto a = db().getNode("A");
    const auto b = db().getNode("B");
    ASSERT_TRUE(a && a->driver());
    EXPECT_TRUE(a->ServerName.isEmpty());  // the other properties stay empty
    EXPECT_EQ(
        (std::vector<Variant>{a->OPCTopic, a->ScanRate, a->TagPrefex, b->ScanRate, b->TagPrefex}),
        (std::vector<Variant>{"", 0, 0, 250, 3}));
    EXPECT_EQ(names(), (std::vector<std::string>{"A", "B"}));
}

TEST_F(NodeDBTest, RemoveAllNodesEmptiesAndScanningAnEmptyCollectionDoesNothing) {
    db().AddNode("A", "MEMTAG");
    db().AddNode("B", "MEMTAG");
    std::weak_ptr<node> a = db().getNode("A");
    db().StartScanning();
    db().RemoveAllNodes();
    EXPECT_EQ(db().count(), 0);
    EXPECT_TRUE(a.expired());
    EXPECT_NO_THROW(db().StartScanning());
    EXPECT_NO_THROW(db().StopScanning());
    db().AddNode("A", "MEMTAG");  // a new collection on next use
    EXPECT_EQ(db().count(), 1);
}

TEST_F(NodeDBTest, NodeWhoseInitFailedStaysWithoutDriverAndStopsScanning) {
    const auto file = project(
        "insert into Nodes (Name, Driver) values ('A', null);"
        "insert into Nodes (Name, Driver) values ('B', 'MEMTAG');");
    EXPECT_EQ(loadError(file), err::InvalidUseOfNull);
    EXPECT_EQ(names(), std::vector<std::string>{"A"});
    EXPECT_FALSE(db().getNode("A")->driver());
    EXPECT_EQ(errorOf([&] { db().StartScanning(); }), err::ObjectNotSet);
    runtime().trap().setEnabled(true);
    EXPECT_NO_THROW(db().StartScanning());
    EXPECT_EQ(errorLogRecords(), 6u);
}

TEST_F(NodeDBTest, ReportsAreRaisedAsTheyCome) {
    VbArray<int32_t> ids(1, 0);
    VbArray<Variant> values(1, 0);
    db().NewValue(ids, 0, values);  // a count of 0 still raises
    db().NUVError("OPC Driver", "ClsDriverOPC.ReadItem", "ClientHandle: 4 Error: bad");
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].count, 0);
    ASSERT_EQ(host.errors.size(), 1u);
    EXPECT_EQ(host.errors[0].driver, "OPC Driver");
    EXPECT_EQ(host.errors[0].from, "ClsDriverOPC.ReadItem");
    EXPECT_EQ(host.errors[0].message, "ClientHandle: 4 Error: bad");
}

TEST_F(NodeDBTest, LoadsRowsInOrderWithValuesAsDelivered) {
    const auto file = project(
        "insert into Nodes values ('Line1','memtag','srv','top',500,2,19200,'pre','10.0.0.5',502);"
        "insert into Nodes values ('Mixer','XYZ',null,null,null,null,null,null,null,null);"
        "insert into Nodes values (42,'',null,null,1000,null,null,null,null,null);");
    db().AddAllNodes(file);
    EXPECT_EQ(names(), (std::vector<std::string>{"Line1", "Mixer", "42"}));
    const auto l = db().getNode("Line1");
    EXPECT_EQ(
        (std::vector<Variant>{l->DriverName, l->ServerName, l->OPCTopic, l->ScanRate, l->SerialPort,
                              l->BaudRate, l->TagPrefex, l->IPAddress, l->Port}),
        (std::vector<Variant>{"memtag", "srv", "top", 500, 2, 19200, "pre", "10.0.0.5", 502}));
    EXPECT_TRUE(db().getNode("Mixer")->ServerName.isNull());
    for (const auto& n : db().nodes()) EXPECT_TRUE(n->driver()) << n->Name;
}

TEST_F(NodeDBTest, EmptyTableLoadsNothingButMissingFileTableOrColumnEndsTheLoad) {
    EXPECT_EQ(loadError(project("")), 0);
    EXPECT_TRUE(host.changes.empty() && host.errors.empty());
    std::filesystem::remove(driveRoot() / "project.db");
    EXPECT_EQ(loadError((driveRoot() / "absent.db").string()), err::CouldNotFindFile);
    EXPECT_EQ(loadError(project("", "create table Other (x);")), err::TableNotFound);
    std::filesystem::remove(driveRoot() / "project.db");
    EXPECT_EQ(loadError(project("insert into Nodes values ('A','MEMTAG');",
                                "create table Nodes (Name text, Driver text);")),
              err::ItemNotFound);
    EXPECT_EQ(db().count(), 0);
}

TEST_F(NodeDBTest, DuplicateNameEndsTheLoadAtThatRow) {
    const auto file = project(
        "insert into Nodes (Name, Driver) values ('A','MEMTAG');"
        "insert into Nodes (Name, Driver) values ('B','MEMTAG');"
        "insert into Nodes (Name, Driver) values ('a','DISKTAG');"
        "insert into Nodes (Name, Driver) values ('C','MEMTAG');");
    EXPECT_EQ(loadError(file), err::DuplicateKey);
    EXPECT_EQ(names(), (std::vector<std::string>{"A", "B"}));
    EXPECT_TRUE(db().getNode("B")->driver());
    EXPECT_FALSE(std::filesystem::exists(driveRoot() / "NUVDiskIO" / "a.mdb"));  // no Init
    EXPECT_EQ(loadError(file), err::DuplicateKey);  // loading again fails on the first row
    EXPECT_EQ(db().count(), 2);
}

TEST_F(NodeDBTest, TrappedDuplicateIsLoggedSixTimesThenSkippedButStillStarted) {
    runtime().trap().setEnabled(true);
    const auto file = project(
        "insert into Nodes (Name, Driver) values ('A','MEMTAG');"
        "insert into Nodes (Name, Driver) values ('a','DISKTAG');"
        "insert into Nodes (Name, Driver) values ('C','MEMTAG');");
    EXPECT_EQ(loadError(file), 0);
    EXPECT_EQ(names(), (std::vector<std::string>{"A", "C"}));
    EXPECT_TRUE(std::filesystem::exists(driveRoot() / "NUVDiskIO" / "a.mdb"));
    EXPECT_EQ(errorLogRecords(), 6u);
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_NE(log.find("Module\\Sub: NodeDB.AddAllNodes 0\r\n"), std::string::npos);
    EXPECT_NE(log.find("Message: Error #457 was generated by Maroset.NodeDB\r\n"),
              std::string::npos);
}

TEST_F(NodeDBTest, TrappedMissingFileEndsTheLoadWithoutLooping) {
    runtime().trap().setEnabled(true);
    EXPECT_EQ(loadError((driveRoot() / "absent.db").string()), 0);
    EXPECT_EQ(db().count(), 0);
    EXPECT_GE(errorLogRecords(), 6u);
}

}  // namespace
}  // namespace maroset
