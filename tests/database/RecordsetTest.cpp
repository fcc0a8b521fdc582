#include "platform/Recordset.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <functional>
#include <string>

#include "core/VbError.h"
#include "platform/Database.h"
#include "support/ErrorOf.h"
#include "support/TempDir.h"

namespace maroset::platform {
namespace {

namespace fs = std::filesystem;

using test::errorOf;

class RecordsetFixture : public ::testing::Test {
  protected:
    void SetUp() override {
        auto db = Database::Create(file());
        db->Execute(
            "CREATE TABLE TagValues (ID INTEGER PRIMARY KEY AUTOINCREMENT, TagName TEXT, "
            "TagValue TEXT)");
        db->Execute("CREATE UNIQUE INDEX IDIndex ON TagValues (ID)");
        // A table without an integer key, as a project database may have.
        db->Execute(
            "CREATE TABLE Nodes (Name TEXT, Driver TEXT, UpdateRate INTEGER, "
            "Port NUMERIC)");
        db->Execute("INSERT INTO TagValues (TagName, TagValue) VALUES ('Level', '0')");
        db->Execute("INSERT INTO TagValues (TagName, TagValue) VALUES ('Flow', '1')");
        db->Execute("INSERT INTO Nodes VALUES ('Line1', 'DiskTag', 1000, 502)");
        db->Execute("INSERT INTO Nodes VALUES ('Line1', 'DiskTag', 1000, 502)");
        db->Execute("INSERT INTO Nodes VALUES ('Line2', 'MemTag', 500, NULL)");
    }
    fs::path file() const { return dir_.path() / "Line1.mdb"; }

    // A fresh connection of our own: what a restarted process would read.
    Variant freshValue(const std::string& query, const std::string& field) const {
        auto rs = Database::Open(file())->OpenRecordset(query);
        rs->MoveFirst();
        return rs->Fields(field);
    }

    test::TempDir dir_;
};

using RecordsetCursor = RecordsetFixture;

TEST_F(RecordsetCursor, WalksEveryRowThenReportsEndOfFile) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    ASSERT_EQ(rs->RecordCount(), 3);
    rs->MoveFirst();
    std::string names;
    while (!rs->eof()) {
        names += rs->Fields("Name").string() + ";";
        rs->MoveNext();
    }
    EXPECT_EQ(names, "Line1;Line1;Line2;");
    EXPECT_EQ(errorOf([&] { rs->MoveNext(); }), err::NoCurrentRecord);
    EXPECT_EQ(errorOf([&] { rs->Fields("Name"); }), err::NoCurrentRecord);
    EXPECT_EQ(errorOf([&] { rs->Edit(); }), err::NoCurrentRecord);
}

TEST_F(RecordsetCursor, EmptyRecordsetHasNoCurrentRecord) {
    auto rs = Database::Open(file())->OpenRecordset(
        "select * from TagValues  where TagName like 'Missing'");
    EXPECT_EQ(rs->RecordCount(), 0);
    EXPECT_TRUE(rs->eof());
    EXPECT_TRUE(rs->bof());
    EXPECT_EQ(errorOf([&] { rs->MoveFirst(); }), err::NoCurrentRecord);
    EXPECT_EQ(errorOf([&] { rs->Fields("TagValue"); }), err::NoCurrentRecord);
}

TEST_F(RecordsetCursor, UnknownFieldIsItemNotFound) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    EXPECT_EQ(errorOf([&] { rs->Fields("OPCServer"); }), err::ItemNotFound);
    rs->Edit();
    EXPECT_EQ(errorOf([&] { rs->setField("OPCServer", Variant("x")); }), err::ItemNotFound);
}

TEST_F(RecordsetCursor, NumbersAndNullsComeAsStored) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    rs->MoveFirst();
    EXPECT_EQ(rs->Fields("UpdateRate"), Variant(int32_t{1000}));
    EXPECT_EQ(rs->Fields("port"), Variant(int32_t{502}));
    rs->MoveNext();
    rs->MoveNext();
    EXPECT_TRUE(rs->Fields("Port").isNull());
}

using RecordsetUpdates = RecordsetFixture;

TEST_F(RecordsetUpdates, EditWritesTheTextOfTheValueAndAFreshConnectionSeesIt) {
    {
        auto rs = Database::Open(file())->OpenRecordset(
            "select * from TagValues  where TagName like 'Level'");
        rs->MoveFirst();
        rs->Edit();
        rs->setField("Tagvalue", Variant(12.5));
        rs->Update();
        EXPECT_EQ(rs->Fields("TagValue"), Variant("12.5")) << "row not read back after Update";
    }
    EXPECT_EQ(freshValue("select * from TagValues where TagName like 'Level'", "TagValue"),
              Variant("12.5"));
    EXPECT_EQ(freshValue("select * from TagValues where TagName like 'Flow'", "TagValue"),
              Variant("1"))
        << "another row changed";
}

TEST_F(RecordsetUpdates, TextFieldsTakeTheLanguagesTextOfEveryKind) {
    auto db = Database::Open(file());
    auto store = [&](const Variant& v) {
        auto rs = db->OpenRecordset("select * from TagValues  where TagName like 'Flow'");
        rs->MoveFirst();
        rs->Edit();
        rs->setField("TagValue", v);
        rs->Update();
        return freshValue("select * from TagValues where TagName like 'Flow'", "TagValue");
    };
    EXPECT_EQ(store(Variant(int16_t{0})), Variant("0"));
    EXPECT_EQ(store(Variant(true)), Variant("True"));
    EXPECT_EQ(store(Variant(1.0f / 3.0f)), Variant("0.3333333"));
    EXPECT_EQ(store(Variant("abc")), Variant("abc"));
    EXPECT_TRUE(store(Variant::Null()).isNull());
}

TEST_F(RecordsetUpdates, AddNewInsertsARowWithItsKeyAndKeepsTheCursor) {
    auto rs =
        Database::Open(file())->OpenRecordset("select * from TagValues  where TagName like 'Temp'");
    ASSERT_TRUE(rs->eof());
    rs->AddNew();
    rs->setField("TagName", Variant("Temp"));
    rs->setField("Tagvalue", Variant(int16_t{0}));
    rs->Update();
    EXPECT_TRUE(rs->eof()) << "the current record moved on AddNew";
    EXPECT_EQ(rs->RecordCount(), 1);
    rs->MoveFirst();
    EXPECT_EQ(rs->Fields("ID"), Variant(int32_t{3}));
    EXPECT_EQ(freshValue("select * from TagValues where TagName like 'Temp'", "TagValue"),
              Variant("0"));
}

TEST_F(RecordsetUpdates, RowsWithoutAKeyAreFoundByTheirValues) {
    auto rs = Database::Open(file())->OpenRecordset("select * from Nodes ");
    rs->MoveFirst();
    rs->MoveNext();  // the second of two identical rows
    rs->Edit();
    rs->setField("Driver", Variant("OPC"));
    rs->Update();
    rs->MoveNext();
    rs->Edit();
    rs->setField("UpdateRate", Variant("250"));  // text into a number column
    rs->Update();
    auto check = Database::Open(file())->OpenRecordset("select * from Nodes ");
    std::string drivers;
    for (check->MoveFirst(); !check->eof(); check->MoveNext())
        drivers += check->Fields("Driver").string() + ";";
    EXPECT_EQ(drivers, "OPC;DiskTag;MemTag;") << "exactly one of the two rows changes";
    EXPECT_EQ(freshValue("select * from Nodes where Name like 'Line2'", "UpdateRate"),
              Variant(int32_t{250}));
}

TEST_F(RecordsetUpdates, UpdateOfARowDeletedMeanwhileFails) {
    auto rs = Database::Open(file())->OpenRecordset("select * from TagValues");
    rs->MoveFirst();
    Database::Open(file())->Execute("DELETE FROM TagValues WHERE TagName = 'Level'");
    rs->Edit();
    rs->setField("TagValue", Variant("9"));
    EXPECT_EQ(errorOf([&] { rs->Update(); }), 3167);
}

TEST_F(RecordsetUpdates, UpdateWithoutEditOrAddNewFails) {
    auto rs = Database::Open(file())->OpenRecordset("select * from TagValues");
    rs->MoveFirst();
    EXPECT_EQ(errorOf([&] { rs->Update(); }), 3020);
    EXPECT_EQ(errorOf([&] { rs->setField("TagValue", Variant("1")); }), 3020);
    rs->Edit();
    rs->setField("TagValue", Variant("1"));
    rs->MoveNext();  // leaving the record drops the edit
    EXPECT_EQ(errorOf([&] { rs->Update(); }), 3020);
}

TEST_F(RecordsetUpdates, QueriesNotOnOneTableAreReadOnly) {
    auto db = Database::Open(file());
    auto rs = db->OpenRecordset("select count(*) AS n from TagValues");
    EXPECT_FALSE(rs->Updatable());
    EXPECT_EQ(errorOf([&] { rs->AddNew(); }), 3027);
    auto joined =
        db->OpenRecordset("select a.TagName, b.TagName AS Other from TagValues a, TagValues b");
    EXPECT_FALSE(joined->Updatable());
    joined->MoveFirst();
    EXPECT_EQ(errorOf([&] { joined->Edit(); }), 3027);
}

}  // namespace
}  // namespace maroset::platform
