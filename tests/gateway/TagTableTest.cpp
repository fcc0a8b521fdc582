#include "gateway/TagTable.h"

#include <gtest/gtest.h>

#include "core/ClsNodeDBInterface.h"
#include "core/nodeDB.h"
#include "gateway/TagBook.h"
#include "platform/Database.h"
#include "support/ErrorOf.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using gateway::TagTable;

class TagTableTest : public test::RuntimeFixture {
  protected:
    TagTableTest() {
        platform::Database::Create(project_)->Execute(
            "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
            "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, "
            "IPAddress TEXT, Port INTEGER)");
        platform::Database::Open(project_)->Execute(
            "insert into Nodes (Name, Driver) values ('Mem', 'MEMTAG')");
    }

    std::filesystem::path project_ = driveRoot() / "plant.db";
};

TEST_F(TagTableTest, RowsAreAddedListedAndRemovedWithTheirNames) {
    EXPECT_TRUE(TagTable::Rows(project_).empty()) << "a project without a Tags table";
    TagTable::Add(project_, {"Mem", 7, "Setpoint", "Set point"});
    TagTable::Add(project_, {"Mem", 8, "Level'); drop table Nodes; --", ""});
    TagTable::Add(project_, {"Other", 7, "X", ""});
    EXPECT_EQ(test::errorOf([&] { TagTable::Add(project_, {"MEM", 7, "Again", ""}); }), 457);

    const auto rows = TagTable::Rows(project_);
    ASSERT_EQ(rows.size(), 3u);
    EXPECT_EQ(rows[0].name, "Set point");
    EXPECT_EQ(rows[1].address, "Level'); drop table Nodes; --");
    EXPECT_EQ(rows[1].name, rows[1].address) << "no name: called by its address";

    EXPECT_TRUE(TagTable::Remove(project_, "mem", 8));
    EXPECT_FALSE(TagTable::Remove(project_, "Mem", 8));
    EXPECT_FALSE(TagTable::Remove(project_, "Mem", 9));
    ASSERT_EQ(TagTable::Rows(project_).size(), 2u);
    EXPECT_EQ(
        platform::Database::Open(project_)->OpenRecordset("select * from Nodes")->RecordCount(), 1);
}

TEST_F(TagTableTest, BadRowsAreToldOneLineEachAndTheRestAreRegistered) {
    ClsNodeDBInterface host;
    nodeDB& db = *host.nodeDB();
    db.AddAllNodes(project_.string());
    std::vector<std::string> bad;
    const auto registered =
        TagTable::Register(db,
                           {{"Mem", 1, "A", "A"},
                            {"Pump", 2, "B", "B"},
                            {"Mem", 0, "C", "C"},
                            {"Mem", 32768, "D", "D"},
                            {"mem", 1, "E", "E"},
                            {"Mem", 32767, "F", "F"}},
                           [&](const std::string& line) { bad.push_back(line); });
    ASSERT_EQ(registered.size(), 2u);
    EXPECT_EQ(registered[0].address, "A");
    EXPECT_EQ(registered[1].address, "F");
    ASSERT_EQ(bad.size(), 4u);
    EXPECT_EQ(bad[0], "tag Pump 2 (B): no node named 'Pump' in the project");
    EXPECT_EQ(bad[1], "tag Mem 0 (C): handle out of range (1 to 32767)");
    EXPECT_EQ(bad[2], "tag Mem 32768 (D): handle out of range (1 to 32767)");
    EXPECT_EQ(bad[3], "tag mem 1 (E): handle 1 is already used on mem");

    // The registered tags are live: a write comes back as the tag's value.
    gateway::TagBook book(runtime().reports(), runtime().clock(), registered);
    db.StartScanning();
    db.getNode("Mem")->WriteTag("32767", Variant(5));
    ASSERT_NE(book.find("MEM", 32767), nullptr);
    EXPECT_EQ(book.find("MEM", 32767)->value, Variant(5));
    EXPECT_EQ(book.find("Mem", 32767)->changes, 1u);
    EXPECT_EQ(book.find("Mem", 1)->changes, 0u);
    EXPECT_EQ(book.find("Mem", 2), nullptr);
    db.StopScanning();
    db.RemoveAllNodes();
}

TEST_F(TagTableTest, AHandleThatIsNoNumberIsReportedNotRegistered) {
    platform::Database::Open(project_)->Execute(
        "CREATE TABLE Tags (Node TEXT, Handle INTEGER, Address TEXT, Name TEXT)");
    platform::Database::Open(project_)->Execute(
        "insert into Tags values ('Mem', 'seven', 'A', NULL), ('Mem', NULL, 'B', NULL), "
        "('Mem', 3, 'C', 'Named')");
    const auto rows = TagTable::Rows(project_);
    ASSERT_EQ(rows.size(), 3u);
    ClsNodeDBInterface host;
    host.nodeDB()->AddAllNodes(project_.string());
    std::vector<std::string> bad;
    const auto registered =
        TagTable::Register(*host.nodeDB(), rows, [&](const std::string& l) { bad.push_back(l); });
    ASSERT_EQ(registered.size(), 1u);
    EXPECT_EQ(registered[0].name, "Named");
    EXPECT_EQ(bad.size(), 2u);
    host.nodeDB()->RemoveAllNodes();
}

}  // namespace
}  // namespace maroset
