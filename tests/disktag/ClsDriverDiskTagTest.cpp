#include "drivers/local/ClsDriverDiskTag.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sqlite3.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>

#include "core/node.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"
#include "support/SqlScript.h"

namespace maroset {
namespace {

namespace fs = std::filesystem;

using namespace std::string_literals;
using test::errorOf;
using Names = std::vector<std::string>;

// Reads a tag file with SQLite itself: rows as "a=b" joined by ";" ("TagName=TagValue" by ID).
std::string RowsOf(
    const fs::path& file,
    const std::string& query = "SELECT TagName, TagValue FROM TagValues ORDER BY ID") {
    sqlite3* db = nullptr;
    std::string rows;
    sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READONLY, nullptr);
    const auto row = [](void* out, int n, char** values, char**) {
        auto& rows = *static_cast<std::string*>(out);
        for (int i = 0; i < n; ++i)
            rows += (i ? "=" : "") + std::string(values[i] ? values[i] : "<null>");
        rows += ";";
        return 0;
    };
    if (sqlite3_exec(db, query.c_str(), row, &rows, nullptr) != SQLITE_OK)
        rows = std::string("<") + sqlite3_errmsg(db) + ">";
    sqlite3_close(db);
    return rows;
}

class DiskTagFixture : public test::RuntimeFixture {
  protected:
    fs::path folder() const { return driveRoot() / "NUVDiskIO"; }
    fs::path file(const std::string& node = "Line1") const { return folder() / (node + ".mdb"); }
    std::string rows() const { return RowsOf(file()); }
    std::string bytes() const { return readDriveFile("NUVDiskIO/Line1.mdb"); }
    void started() { driver.startup("ServerName", "Line1"); }
    void withLevel() {
        started();
        driver.AddItem("Level", 5);
    }
    // The only report so far: this handle and value, count 1, both arrays from index 1.
    void expectReport(int32_t handle, const Variant& value) {
        ASSERT_EQ(host.changes.size(), 1u);
        const auto& c = host.changes[0];
        EXPECT_EQ((std::vector<int>{c.count, c.handlesLower, c.valuesLower}),
                  (std::vector<int>{1, 1, 1}));
        EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{handle});
        EXPECT_EQ(host.changes[0].values, std::vector<Variant>{value});
        host.changes.clear();
    }

    test::HostRecorder host;
    ClsDriverDiskTag driver;
};

// --- The file ---------------------------------------------------------------------------------

using DiskTagFile = DiskTagFixture;

TEST_F(DiskTagFile, FirstStartupCreatesTheFileWithTableAndIndexAndASecondLeavesIt) {
    started();
    EXPECT_EQ(driver.DatabasePath(), "C:\\NUVDiskIO\\Line1.mdb");
    EXPECT_EQ(RowsOf(file(), "SELECT name, type, pk FROM pragma_table_info('TagValues')"),
              "ID=INTEGER=1;TagName=TEXT=0;TagValue=TEXT=0;");
    EXPECT_EQ(RowsOf(file(), "SELECT name FROM pragma_index_info('IDIndex')"), "ID;");
    driver.AddItem("Level", 5);
    driver.WriteItem(5, 7);
    const std::string before = bytes();
    const auto stamp = fs::last_write_time(file());

    ClsDriverDiskTag again;
    again.startup("ServerName", "Line1");
    EXPECT_EQ(bytes(), before);
    EXPECT_EQ(fs::last_write_time(file()), stamp);
    // Each node has its own file.
    again.startup("ignored", "Line2");
    again.AddItem("Flow", 1);
    EXPECT_EQ(RowsOf(file("Line2")), "Flow=0;");
    EXPECT_EQ(rows(), "Level=7;");
}

TEST_F(DiskTagFile, NodeNameLeavingTheDriveRootIsRefusedAndCreatesNothing) {
    const fs::path outside = driveRoot().parent_path();
    for (const auto& node : {"..\\..\\Escaped"s, "../../Escaped"s, "Line1\0/../../Escaped"s}) {
        EXPECT_EQ(errorOf([&] { driver.startup("ServerName", node); }), err::PathFileAccess);
        // The operations that open the file refuse the path as well.
        EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::PathFileAccess);
        EXPECT_FALSE(fs::exists(outside / "Escaped.mdb"));
    }
}

TEST_F(DiskTagFile, FileThatIsNotADatabaseIsLeftAloneAndFailsTheOperations) {
    fs::create_directory(folder());
    std::ofstream(file()) << std::string(200, 'x');
    started();
    EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::UnrecognizedDatabase);
    EXPECT_EQ(bytes(), std::string(200, 'x'));
}

// --- The tag table ----------------------------------------------------------------------------

using DiskTagTable = DiskTagFixture;

TEST_F(DiskTagTable, SlotZeroIsUnusedAndOneEmptySlotFollowsTheLastTag) {
    started();
    driver.AddItem("Level", 5);
    driver.AddItem("Flow", 6);
    driver.AddItem("Level", 9);  // registered twice, its row made once
    EXPECT_EQ(driver.TagNames().items(), (Names{"", "Level", "Flow", "Level", ""}));
    EXPECT_EQ(driver.ClientHandles().items(), (std::vector<int32_t>{0, 5, 6, 9, 0}));
    EXPECT_EQ(rows(), "Level=0;Flow=0;");
    started();  // a new startup empties the table
    EXPECT_EQ(driver.TagNames().items(), (Names{"", ""}));
    EXPECT_EQ(errorOf([&] { driver.ReadItem(5); }), err::SubscriptOutOfRange);
}

TEST_F(DiskTagTable, HandleFindsTheFirstSlotFromOneOnAndAnUnknownOneIsOutOfRange) {
    EXPECT_EQ(errorOf([&] { driver.AddItem("Level", 5); }), err::SubscriptOutOfRange)
        << "before startup";
    withLevel();
    driver.AddItem("Flow", 5);
    driver.RemoveItem(5);  // leaves it registered
    driver.WriteItem(5, 1);
    EXPECT_EQ(rows(), "Level=1;Flow=0;");
    host.changes.clear();
    EXPECT_EQ(errorOf([&] { driver.ReadItem(6); }), err::SubscriptOutOfRange);
    EXPECT_EQ(errorOf([&] { driver.WriteItem(6, 1); }), err::SubscriptOutOfRange);
    // Handle 0 finds the empty slot, and so the row with the empty name.
    test::RunSqlScript(file(), "INSERT INTO TagValues (TagName, TagValue) VALUES ('', 'e');");
    driver.ReadItem(0);
    expectReport(0, Variant("e"));
}

// --- Values -----------------------------------------------------------------------------------

using DiskTagValues = DiskTagFixture;

TEST_F(DiskTagValues, AddItemCreatesTheRowWithZeroAndReadItemReportsItsText) {
    started();
    test::RunSqlScript(file(), "INSERT INTO TagValues (TagName, TagValue) VALUES ('Flow', '42');");
    EXPECT_FALSE(driver.AddItem("Level", 5));
    driver.AddItem("Flow", 6);  // an existing row stays as it is
    EXPECT_EQ(rows(), "Flow=42;Level=0;");
    EXPECT_EQ(driver.ReadItem(5), 0);
    expectReport(5, Variant("0"));
}

TEST_F(DiskTagValues, WriteStoresTheTextAndReportsTheWrittenValue) {
    withLevel();
    EXPECT_EQ(driver.WriteItem(5, 12.5), 0);
    EXPECT_EQ(rows(), "Level=12.5;");
    expectReport(5, Variant(12.5));  // the written Double, not the stored text
    driver.ReadItem(5);
    expectReport(5, Variant("12.5"));
    // Values of every kind are stored as text.
    const std::pair<Variant, std::string> cases[] = {
        {Variant(true), "True"},  {Variant(int16_t{-3}), "-3"}, {Variant(0.1f), "0.1"},
        {Variant(1e20), "1E+20"}, {Variant("'q'"), "'q'"},      {Variant::Null(), "<null>"}};
    for (const auto& [value, text] : cases) {
        driver.WriteItem(5, value);
        EXPECT_EQ(rows(), "Level=" + text + ";");
    }
}

TEST_F(DiskTagValues, HandlerWritingAnotherTagDuringTheReportWorks) {
    withLevel();
    driver.AddItem("Echo", 6);
    auto sub = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>& ids, int16_t, VbArray<Variant>& values) {
            if (ids(1) == 5) driver.WriteItem(6, values(1));
        });
    driver.WriteItem(5, 8);
    EXPECT_EQ(rows(), "Level=8;Echo=8;");
}

TEST_F(DiskTagValues, WriteToAMissingRowFailsWithNoCurrentRecordAndReportsNothing) {
    withLevel();
    test::RunSqlScript(file(), "DELETE FROM TagValues;");
    EXPECT_EQ(errorOf([&] { driver.WriteItem(5, 1); }), err::NoCurrentRecord);
    driver.ReadItem(5);
    EXPECT_TRUE(host.changes.empty());
    EXPECT_EQ(rows(), "");
}

TEST_F(DiskTagValues, NamesMatchByTheLikeRules) {
    withLevel();
    driver.WriteItem(5, 4);
    driver.AddItem("Lev*", 7);   // finds Level, so no row is added
    driver.AddItem("LEVEL", 8);  // the same name in another case
    driver.AddItem("500", 3);
    driver.AddItem("50%", 1);  // % and _ are ordinary characters
    driver.AddItem("50_", 2);
    EXPECT_EQ(rows(), "Level=4;500=0;50%=0;50_=0;");
    host.changes.clear();
    driver.ReadItem(7);
    expectReport(7, Variant("4"));
    driver.WriteItem(7, 9);
    driver.WriteItem(1, 1);
    EXPECT_EQ(rows(), "Level=9;500=0;50%=1;50_=0;");
}

TEST_F(DiskTagValues, QuoteFailsTheQueryAndASecondStatementIsRefused) {
    withLevel();
    EXPECT_EQ(errorOf([&] { driver.AddItem("O'Brien", 6); }), err::QuerySyntax);
    EXPECT_EQ(driver.TagNames().items(), (Names{"", "Level", "O'Brien", ""}));
    const std::string evil = "x'; DELETE FROM TagValues; UPDATE TagValues SET TagValue='9";
    EXPECT_EQ(errorOf([&] { driver.AddItem(evil, 7); }), err::CharactersAfterEnd);
    EXPECT_EQ(errorOf([&] { driver.WriteItem(7, 1); }), err::CharactersAfterEnd);
    EXPECT_EQ(rows(), "Level=0;");
}

TEST_F(DiskTagValues, WriteReportedBeforeTheProcessIsKilledSurvives) {
    withLevel();
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
    expectReport(5, Variant("12.5"));
}

// --- Error trap and node ----------------------------------------------------------------------

TEST_F(DiskTagFixture, TrappedFailuresAreLoggedRetriedThenSkipped) {
    runtime().trap().setEnabled(true);
    withLevel();
    EXPECT_NO_THROW(driver.ReadItem(6));
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_EQ(errorLogRecords(), 6u) << log;
    EXPECT_NE(log.find("Module\\Sub: ClsDriverDiskTag.ReadItem 0\r\n"), std::string::npos) << log;
    EXPECT_NE(log.find("Error #9 was generated by "), std::string::npos) << log;
    EXPECT_TRUE(host.changes.empty());
    test::RunSqlScript(file(), "DELETE FROM TagValues;");
    EXPECT_NO_THROW(driver.WriteItem(5, 1));
    EXPECT_NE(readDriveFile("MarosetErrors.txt").find("ClsDriverDiskTag.WriteItem"),
              std::string::npos);
}

TEST_F(DiskTagFixture, NodeOfTypeDiskTagStartsTheDriverAndWritesThrough) {
    auto n = std::make_shared<node>();
    n->Name = "Line1";
    n->DriverName = Variant("DISKTAG");
    n->Init();
    ASSERT_NE(dynamic_cast<ClsDriverDiskTag*>(n->driver().get()), nullptr);
    EXPECT_TRUE(fs::is_regular_file(file()));
    n->AddTag(5, "Level");
    n->WriteTag("5", Variant(12.5));
    EXPECT_EQ(rows(), "Level=12.5;");
    expectReport(5, Variant(12.5));
}

}  // namespace
}  // namespace maroset
