#include "drivers/local/ClsDriverDiskTag.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <vector>

#include "core/Runtime.h"
#include "core/node.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"
#include "support/SqlScript.h"

namespace maroset {
namespace {

namespace fs = std::filesystem;

using test::errorOf;

// Reads a tag file with SQLite itself: rows as "name=value" joined by ";" in ID order.
std::string RowsOf(
    const fs::path& file,
    const std::string& query = "SELECT TagName, TagValue FROM TagValues ORDER BY ID") {
    sqlite3* db = nullptr;
    if (sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READONLY, nullptr) != SQLITE_OK) {
        sqlite3_close(db);
        return "<cannot open>";
    }
    sqlite3_stmt* s = nullptr;
    std::string rows;
    if (sqlite3_prepare_v2(db, query.c_str(), -1, &s, nullptr) != SQLITE_OK) {
        rows = std::string("<") + sqlite3_errmsg(db) + ">";
    } else {
        while (sqlite3_step(s) == SQLITE_ROW) {
            for (int i = 0; i < sqlite3_column_count(s); ++i) {
                const auto* text = sqlite3_column_text(s, i);
                rows += (i ? "=" : "") +
                        (text ? std::string(reinterpret_cast<const char*>(text)) : "<null>");
            }
            rows += ";";
        }
    }
    sqlite3_finalize(s);
    sqlite3_close(db);
    return rows;
}

std::string Bytes(const fs::path& file) {
    std::ifstream in(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

class DiskTagFixture : public test::RuntimeFixture {
  protected:
    fs::path folder() const { return driveRoot() / "NUVDiskIO"; }
    fs::path file(const std::string& node = "Line1") const { return folder() / (node + ".mdb"); }
    std::string rows() const { return RowsOf(file()); }
    void started() { driver.startup("ServerName", "Line1"); }

    test::HostRecorder host;
    ClsDriverDiskTag driver;
};

// --- The file ---------------------------------------------------------------------------------

using DiskTagFile = DiskTagFixture;

TEST_F(DiskTagFile, FirstStartupCreatesTheFolderAndTheFileWithTableAndIndex) {
    ASSERT_FALSE(fs::exists(folder()));
    started();
    EXPECT_TRUE(fs::is_directory(folder()));
    EXPECT_TRUE(fs::is_regular_file(file()));
    EXPECT_EQ(driver.DatabasePath(), "C:\\NUVDiskIO\\Line1.mdb");
    EXPECT_EQ(RowsOf(file(), "SELECT name, type, pk FROM pragma_table_info('TagValues')"),
              "ID=INTEGER=1;TagName=TEXT=0;TagValue=TEXT=0;");
    EXPECT_EQ(RowsOf(file(),
                     "SELECT tbl_name FROM sqlite_master WHERE type = 'index' AND "
                     "name = 'IDIndex'"),
              "TagValues;");
    EXPECT_EQ(RowsOf(file(), "SELECT name FROM pragma_index_info('IDIndex')"), "ID;");
    EXPECT_EQ(rows(), "");
    EXPECT_TRUE(host.changes.empty());
}

TEST_F(DiskTagFile, SecondStartupLeavesTheFileUnchanged) {
    started();
    driver.AddItem("Level", 5);
    driver.WriteItem(5, 7);
    const std::string before = Bytes(file());
    const auto stamp = fs::last_write_time(file());

    ClsDriverDiskTag again;
    again.startup("ServerName", "Line1");
    EXPECT_EQ(Bytes(file()), before);
    EXPECT_EQ(fs::last_write_time(file()), stamp);
    EXPECT_EQ(rows(), "Level=7;");
}

TEST_F(DiskTagFile, ExistingFolderIsUsedAndEachNodeHasItsOwnFile) {
    fs::create_directory(folder());
    started();
    ClsDriverDiskTag line2;
    line2.startup("ignored", "Line2");
    line2.AddItem("Level", 1);
    EXPECT_EQ(RowsOf(file("Line2")), "Level=0;");
    EXPECT_EQ(rows(), "");
}

TEST_F(DiskTagFile, NodeNameLeavingTheDriveRootIsRefusedAndCreatesNothing) {
    const fs::path outside = driveRoot().parent_path();
    const auto before = std::distance(fs::directory_iterator(outside), fs::directory_iterator());
    EXPECT_EQ(errorOf([&] { driver.startup("ServerName", "..\\..\\Escaped"); }),
              err::PathFileAccess);
    EXPECT_EQ(errorOf([&] { driver.startup("ServerName", "../../Escaped"); }), err::PathFileAccess);
    EXPECT_EQ(errorOf([&] { driver.startup("ServerName", std::string("Line1\0/../../x", 15)); }),
              err::PathFileAccess);
    EXPECT_FALSE(fs::exists(outside / "Escaped.mdb"));
    EXPECT_EQ(std::distance(fs::directory_iterator(outside), fs::directory_iterator()), before);
    // The operations that open the file refuse the path as well.
    EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::PathFileAccess);
    EXPECT_FALSE(fs::exists(outside / "Escaped.mdb"));
}

TEST_F(DiskTagFile, FileThatIsNotADatabaseFailsEveryOperation) {
    fs::create_directory(folder());
    std::ofstream(file()) << std::string(200, 'x');
    started();  // an existing file is left alone, whatever it holds
    EXPECT_EQ(Bytes(file()), std::string(200, 'x'));
    EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::UnrecognizedDatabase);
}

// --- The tag table ----------------------------------------------------------------------------

using DiskTagTable = DiskTagFixture;

TEST_F(DiskTagTable, SlotZeroIsUnusedAndOneEmptySlotFollowsTheLastTag) {
    started();
    EXPECT_EQ(driver.TagNames().LBound(), 0);
    EXPECT_EQ(driver.TagNames().UBound(), 1);
    EXPECT_EQ(driver.ClientHandles().UBound(), 1);
    driver.AddItem("Level", 5);
    driver.AddItem("Flow", 6);
    EXPECT_EQ(driver.TagNames().items(), (std::vector<std::string>{"", "Level", "Flow", ""}));
    EXPECT_EQ(driver.ClientHandles().items(), (std::vector<int32_t>{0, 5, 6, 0}));
}

TEST_F(DiskTagTable, RepeatedNameIsRegisteredTwiceAndTheRowMadeOnce) {
    started();
    driver.AddItem("Level", 5);
    driver.AddItem("Level", 9);
    EXPECT_EQ(driver.TagNames().items(), (std::vector<std::string>{"", "Level", "Level", ""}));
    EXPECT_EQ(rows(), "Level=0;");
}

TEST_F(DiskTagTable, RepeatedHandleFindsTheFirstSlot) {
    started();
    driver.AddItem("Level", 5);
    driver.AddItem("Flow", 5);
    driver.WriteItem(5, 1);
    EXPECT_EQ(rows(), "Level=1;Flow=0;");
}

TEST_F(DiskTagTable, UnknownHandleFailsWithSubscriptOutOfRange) {
    started();
    driver.AddItem("Level", 5);
    EXPECT_EQ(errorOf([&] { driver.ReadItem(6); }), err::SubscriptOutOfRange);
    EXPECT_EQ(errorOf([&] { driver.WriteItem(6, 1); }), err::SubscriptOutOfRange);
    EXPECT_EQ(rows(), "Level=0;");
    EXPECT_TRUE(host.changes.empty());
}

TEST_F(DiskTagTable, HandleZeroFindsTheEmptySlotAndItsEmptyName) {
    started();
    driver.AddItem("Level", 5);
    // The empty name has no row: a read reports nothing, a write has no current record.
    EXPECT_EQ(driver.ReadItem(0), 0);
    EXPECT_EQ(errorOf([&] { driver.WriteItem(0, 1); }), err::NoCurrentRecord);
    // A row with an empty name is what handle 0 reaches.
    test::RunSqlScript(file(), "INSERT INTO TagValues (TagName, TagValue) VALUES ('', 'e');");
    driver.ReadItem(0);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{0});
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant("e")});
}

TEST_F(DiskTagTable, RemovedTagStaysRegistered) {
    started();
    driver.AddItem("Level", 5);
    driver.RemoveItem(5);
    driver.ReadItem(5);
    EXPECT_EQ(host.changes.size(), 1u);
}

TEST_F(DiskTagTable, AddBeforeStartupFailsWithSubscriptOutOfRange) {
    EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::SubscriptOutOfRange);
    EXPECT_EQ(errorOf([&] { driver.ReadItem(5); }), err::SubscriptOutOfRange);
    EXPECT_FALSE(fs::exists(folder()));
}

TEST_F(DiskTagTable, StartupEmptiesTheTable) {
    started();
    driver.AddItem("Level", 5);
    started();
    EXPECT_EQ(driver.TagNames().items(), (std::vector<std::string>{"", ""}));
    EXPECT_EQ(errorOf([&] { driver.ReadItem(5); }), err::SubscriptOutOfRange);
}

// --- Values -----------------------------------------------------------------------------------

using DiskTagValues = DiskTagFixture;

TEST_F(DiskTagValues, AddItemCreatesTheRowWithZeroAndReadItemReportsItsText) {
    started();
    EXPECT_FALSE(driver.AddItem("Level", 5));
    EXPECT_EQ(rows(), "Level=0;");
    EXPECT_EQ(driver.ReadItem(5), 0);
    ASSERT_EQ(host.changes.size(), 1u);
    const auto& c = host.changes[0];
    EXPECT_EQ(c.handles, std::vector<int32_t>{5});
    EXPECT_EQ(c.count, 1);
    EXPECT_EQ(c.values, std::vector<Variant>{Variant("0")});
    EXPECT_EQ(c.handlesLower, 1);
    EXPECT_EQ(c.valuesLower, 1);
}

TEST_F(DiskTagValues, AddItemLeavesAnExistingRowAsItIs) {
    started();
    test::RunSqlScript(file(), "INSERT INTO TagValues (TagName, TagValue) VALUES ('Level', '42');");
    driver.AddItem("Level", 5);
    EXPECT_EQ(rows(), "Level=42;");
}

TEST_F(DiskTagValues, WriteStoresTheTextAndReportsTheWrittenValue) {
    started();
    driver.AddItem("Level", 5);
    EXPECT_EQ(driver.WriteItem(5, 12.5), 0);
    EXPECT_EQ(rows(), "Level=12.5;");
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{5});
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant(12.5)})
        << "the written Double goes back, not the stored text";
    driver.ReadItem(5);
    ASSERT_EQ(host.changes.size(), 2u);
    EXPECT_EQ(host.changes[1].values, std::vector<Variant>{Variant("12.5")});
}

TEST_F(DiskTagValues, ValueIsOnDiskWhenTheReportIsRaised) {
    started();
    driver.AddItem("Level", 5);
    std::string seen;
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { seen = rows(); });
    driver.WriteItem(5, 3);
    EXPECT_EQ(seen, "Level=3;");
}

TEST_F(DiskTagValues, ValuesOfEveryKindAreStoredAsText) {
    started();
    driver.AddItem("T", 1);
    const std::vector<std::pair<Variant, std::string>> cases = {
        {Variant(true), "True"},
        {Variant(int16_t{-3}), "-3"},
        {Variant(0.1f), "0.1"},
        {Variant(1e20), "1E+20"},
        {Variant("text 'quoted'"), "text 'quoted'"},
        {Variant::Null(), "<null>"}};
    for (const auto& [value, text] : cases) {
        driver.WriteItem(1, value);
        EXPECT_EQ(rows(), "T=" + text + ";");
    }
}

TEST_F(DiskTagValues, HandlerWritingAnotherTagDuringTheReportWorks) {
    started();
    driver.AddItem("Level", 5);
    driver.AddItem("Echo", 6);
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>& ids, int16_t, VbArray<Variant>& values) {
            if (ids(1) == 5) driver.WriteItem(6, values(1));
        });
    driver.WriteItem(5, 8);
    EXPECT_EQ(rows(), "Level=8;Echo=8;");
}

TEST_F(DiskTagValues, WriteToAMissingRowFailsWithNoCurrentRecordAndReportsNothing) {
    started();
    driver.AddItem("Level", 5);
    test::RunSqlScript(file(), "DELETE FROM TagValues;");
    EXPECT_EQ(errorOf([&] { driver.WriteItem(5, 1); }), err::NoCurrentRecord);
    EXPECT_TRUE(host.changes.empty());
    EXPECT_EQ(rows(), "");
    driver.ReadItem(5);
    EXPECT_TRUE(host.changes.empty()) << "a read of a missing row reports nothing";
}

TEST_F(DiskTagValues, WildcardsInANameMatchOtherRows) {
    started();
    driver.AddItem("Level", 5);
    driver.WriteItem(5, 4);
    driver.AddItem("Lev*", 7);
    EXPECT_EQ(rows(), "Level=4;") << "the pattern found Level, so no row was added";
    host.changes.clear();
    driver.ReadItem(7);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant("4")});
    driver.WriteItem(7, 9);
    EXPECT_EQ(rows(), "Level=9;");
    // "level" and "LEVEL" are the same name to the engine.
    driver.AddItem("LEVEL", 8);
    EXPECT_EQ(rows(), "Level=9;");
}

TEST_F(DiskTagValues, SqlWildcardsAreOrdinaryCharacters) {
    started();
    driver.AddItem("50%", 1);
    driver.AddItem("5_", 2);
    driver.AddItem("500", 3);
    EXPECT_EQ(rows(), "50%=0;5_=0;500=0;");
    driver.WriteItem(1, 1);
    EXPECT_EQ(rows(), "50%=1;5_=0;500=0;");
}

TEST_F(DiskTagValues, QuoteInANameFailsTheQueryAfterRegistering) {
    started();
    EXPECT_EQ(errorOf([&] { driver.AddItem("O'Brien", 5); }), err::QuerySyntax);
    EXPECT_EQ(driver.TagNames().items(), (std::vector<std::string>{"", "O'Brien", ""}));
    EXPECT_EQ(rows(), "");
    EXPECT_EQ(errorOf([&] { driver.ReadItem(5); }), err::QuerySyntax);
}

TEST_F(DiskTagValues, NameCarryingASecondStatementIsRefusedAndNothingRuns) {
    started();
    driver.AddItem("Level", 5);
    driver.WriteItem(5, 2);
    const std::string evil = "x'; DELETE FROM TagValues; UPDATE TagValues SET TagValue='9";
    EXPECT_EQ(errorOf([&] { driver.AddItem(evil, 6); }), err::CharactersAfterEnd);
    EXPECT_EQ(errorOf([&] { driver.WriteItem(6, 1); }), err::CharactersAfterEnd);
    EXPECT_EQ(rows(), "Level=2;");
}

TEST_F(DiskTagValues, WriteReportedBeforeTheProcessIsKilledSurvives) {
    started();
    driver.AddItem("Level", 5);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        // Killed the moment the value is reported: no destructor, no close, no flush.
        auto sub = host.host.ValueChange.subscribe(
            [](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { ::kill(::getpid(), SIGKILL); });
        driver.WriteItem(5, 12.5);
        ::_exit(3);  // not reached when the report came
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFSIGNALED(status)) << "the child was not killed in the report";

    ClsDriverDiskTag restarted;
    restarted.startup("ServerName", "Line1");
    restarted.AddItem("Level", 5);
    restarted.ReadItem(5);
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant("12.5")});
}

// --- Error trap -------------------------------------------------------------------------------

class DiskTagTrapped : public DiskTagFixture {
  protected:
    void SetUp() override { runtime().trap().setEnabled(true); }
};

TEST_F(DiskTagTrapped, FailingStatementIsLoggedRetriedThenSkipped) {
    started();
    driver.AddItem("Level", 5);
    EXPECT_NO_THROW(driver.ReadItem(6));
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_EQ(errorLogRecords(), 6u) << log;
    EXPECT_NE(log.find("Module\\Sub: ClsDriverDiskTag.ReadItem 0\r\n"), std::string::npos) << log;
    EXPECT_NE(log.find("Error #9 was generated by "), std::string::npos) << log;
    EXPECT_TRUE(host.changes.empty());
}

TEST_F(DiskTagTrapped, WriteToAMissingRowDoesNotEscape) {
    started();
    driver.AddItem("Level", 5);
    test::RunSqlScript(file(), "DELETE FROM TagValues;");
    EXPECT_EQ(driver.WriteItem(5, 1), 0);
    EXPECT_EQ(rows(), "");
    EXPECT_NE(readDriveFile("MarosetErrors.txt").find("ClsDriverDiskTag.WriteItem"),
              std::string::npos);
}

// --- Through a node ---------------------------------------------------------------------------

using DiskTagNode = DiskTagFixture;

TEST_F(DiskTagNode, NodeOfTypeDiskTagStartsTheDriverAndWritesThrough) {
    auto n = std::make_shared<node>();
    n->Name = "Line1";
    n->DriverName = Variant("DiskTag");
    n->Init();
    ASSERT_NE(dynamic_cast<ClsDriverDiskTag*>(n->driver().get()), nullptr);
    EXPECT_EQ(n->driver()->NodeName(), "Line1");
    EXPECT_TRUE(fs::is_regular_file(file()));
    n->AddTag(5, "Level");
    n->WriteTag("5", Variant(12.5));
    EXPECT_EQ(rows(), "Level=12.5;");
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant(12.5)});
}

}  // namespace
}  // namespace maroset
