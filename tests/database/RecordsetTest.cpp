#include "platform/Recordset.h"

#include <gtest/gtest.h>

#include "database/ProjectDatabase.h"
#include "support/ErrorOf.h"

namespace maroset::platform {
namespace {

using test::errorOf;

// Edit, set one field and Update: the way the system changes a row.
void change(Recordset& rs, const std::string& field, const Variant& value) {
    rs.Edit();
    rs.setField(field, value);
    rs.Update();
}

using RecordsetReading = ProjectDatabase;

TEST_F(RecordsetReading, WalksEveryRowThenHasNoCurrentRecord) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    ASSERT_EQ(rs->RecordCount(), 3);
    EXPECT_EQ(errorOf([&] { rs->Fields("OPCServer"); }), err::ItemNotFound);
    EXPECT_EQ(errorOf([&] { change(*rs, "OPCServer", "x"); }), err::ItemNotFound);
    std::string names;
    for (rs->MoveFirst(); !rs->eof(); rs->MoveNext()) names += rs->Fields("Name").string() + ";";
    EXPECT_EQ(names, "Line1;Line1;Line2;");
    EXPECT_EQ(errorOf([&] { rs->MoveNext(); }), err::NoCurrentRecord);
    EXPECT_EQ(errorOf([&] { rs->Fields("Name"); }), err::NoCurrentRecord);
    EXPECT_EQ(errorOf([&] { rs->Edit(); }), err::NoCurrentRecord);
    rs = Database::Open(file())->OpenRecordset("select * from Nodes where Name like 'None'");
    EXPECT_TRUE(rs->eof() && rs->bof());
    EXPECT_EQ(errorOf([&] { rs->MoveFirst(); }), err::NoCurrentRecord);
}

TEST_F(RecordsetReading, ValuesComeAsTheDatabaseDeliversThemByNameInAnyCase) {
    auto rs = Database::Open(file())->OpenRecordset(
        "select -7 AS I, 5000000000 AS Big, 2.5 AS R, '12.5' AS T, NULL AS N, x'00ff41' AS B, "
        "Port from Nodes");
    EXPECT_EQ(rs->Fields("I"), Variant(-7));
    EXPECT_EQ(rs->Fields("Big"), Variant(5000000000.0));
    EXPECT_EQ(rs->Fields("R"), Variant(2.5));
    EXPECT_EQ(rs->Fields("t"), Variant("12.5"));
    EXPECT_TRUE(rs->Fields("N").isNull());
    EXPECT_EQ(rs->Fields("B"), Variant(std::string("\0\xff\x41", 3)));
    EXPECT_EQ(rs->Fields("port"), Variant(502));  // a NUMERIC column
}

using RecordsetUpdates = ProjectDatabase;

// The text written for each kind of value is checked through the disk tag driver.
TEST_F(RecordsetUpdates, EditWritesTheTextOfTheValueAndAFreshConnectionSeesIt) {
    auto rs = Database::Open(file())->OpenRecordset("select * from TagValues where ID = 3");
    change(*rs, "Tagvalue", 12.5);
    EXPECT_EQ(rs->Fields("TagValue"), Variant("12.5")) << "row not read back after Update";
    EXPECT_EQ(fresh("select TagValue from TagValues where TagName = 'Flow'"), Variant("12.5"));
    EXPECT_EQ(fresh("select TagValue from TagValues where TagName = 'Level'"), Variant("0"));
}

TEST_F(RecordsetUpdates, AddNewInsertsARowWithItsKeyAndKeepsTheCursor) {
    auto rs = Database::Open(file())->OpenRecordset("select * from TagValues where ID > 4");
    rs->AddNew();
    rs->setField("TagName", Variant("Temp"));
    rs->setField("Tagvalue", Variant(int16_t{0}));
    rs->Update();
    EXPECT_TRUE(rs->eof()) << "the current record moved on AddNew";
    rs->MoveFirst();
    EXPECT_EQ(rs->Fields("ID"), Variant(5));
}

TEST_F(RecordsetUpdates, RowsWithoutAKeyAreFoundByTheirValues) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    rs->MoveNext();  // the second of two identical rows: exactly one of them changes
    change(*rs, "Driver", "OPC");
    rs->MoveNext();
    change(*rs, "UpdateRate", "250");  // text into a number column
    EXPECT_EQ(fresh("select group_concat(Driver) from Nodes"), Variant("OPC,DiskTag,MemTag"));
    EXPECT_EQ(fresh("select UpdateRate from Nodes where Name = 'Line2'"), Variant(250));
}

TEST_F(RecordsetUpdates, UpdateNeedsEditOrAddNewARowThatStillExistsAndOneTable) {
    auto db = Database::Open(file());
    auto rs = db->OpenRecordset("select * from TagValues");
    EXPECT_EQ(errorOf([&] { rs->Update(); }), 3020);
    EXPECT_EQ(errorOf([&] { rs->setField("TagValue", Variant("1")); }), 3020);
    rs->Edit();
    rs->setField("TagValue", Variant("1"));
    rs->MoveNext();  // leaving the record drops the edit
    EXPECT_EQ(errorOf([&] { rs->Update(); }), 3020);
    Database::Open(file())->Execute("DELETE FROM TagValues WHERE TagName = 'Level2'");
    EXPECT_EQ(errorOf([&] { change(*rs, "TagValue", "9"); }), 3167);
    auto count = db->OpenRecordset("select count(*) AS n from TagValues");
    EXPECT_FALSE(count->Updatable());
    EXPECT_EQ(errorOf([&] { count->AddNew(); }), 3027);
    rs = db->OpenRecordset("select * from TagValues where TagName like 'Flow'");
    db.reset();  // the rows outlive their database
    change(*rs, "TagValue", "55");
    EXPECT_EQ(fresh("select TagValue from TagValues where TagName = 'Flow'"), Variant("55"));
}

}  // namespace
}  // namespace maroset::platform
