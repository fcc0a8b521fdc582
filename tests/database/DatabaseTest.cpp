#include "platform/Database.h"

#include <gtest/gtest.h>
#include <sqlite3.h>

#include <chrono>
#include <fstream>
#include <functional>
#include <string>
#include <thread>

#include "core/VbError.h"
#include "support/TempDir.h"

namespace maroset::platform {
namespace {

namespace fs = std::filesystem;

// The VbError number a call fails with (0 when it does not fail); the description goes to
// `description` when asked for.
int32_t ErrorOf(const std::function<void()>& call, std::string* description = nullptr) {
    try {
        call();
    } catch (const VbError& e) {
        if (description) *description = e.description();
        return e.number();
    }
    return 0;
}

// A file made with SQLite directly, so the seam is checked against the engine itself.
class DatabaseFile : public ::testing::Test {
  protected:
    fs::path file() const { return dir_.path() / "Line1.mdb"; }

    void sql(const std::string& statements) const {
        sqlite3* db = nullptr;
        ASSERT_EQ(sqlite3_open(file().c_str(), &db), SQLITE_OK);
        char* error = nullptr;
        const int rc = sqlite3_exec(db, statements.c_str(), nullptr, nullptr, &error);
        const std::string message = error ? error : "";
        sqlite3_free(error);
        sqlite3_close(db);
        ASSERT_EQ(rc, SQLITE_OK) << message;
    }

    // One value read with SQLite directly: what any fresh connection sees.
    std::string scalar(const std::string& query) const {
        sqlite3* db = nullptr;
        sqlite3_open_v2(file().c_str(), &db, SQLITE_OPEN_READONLY, nullptr);
        sqlite3_stmt* s = nullptr;
        std::string value = "<error>";
        if (sqlite3_prepare_v2(db, query.c_str(), -1, &s, nullptr) == SQLITE_OK) {
            value = "<no row>";
            if (sqlite3_step(s) == SQLITE_ROW)
                value = sqlite3_column_type(s, 0) == SQLITE_NULL
                            ? "<null>"
                            : reinterpret_cast<const char*>(sqlite3_column_text(s, 0));
        }
        sqlite3_finalize(s);
        sqlite3_close(db);
        return value;
    }

    void makeTagValues() const {
        sql("CREATE TABLE TagValues (ID INTEGER PRIMARY KEY AUTOINCREMENT, TagName TEXT, "
            "TagValue TEXT);"
            "INSERT INTO TagValues (TagName, TagValue) VALUES ('Level', '3'), ('Level2', '4'), "
            "('Flow', '5'), ('50%', '6'), ('a_b', '7'), ('O''Brien', '8');");
    }

    test::TempDir dir_;
};

using DatabaseOpening = DatabaseFile;

TEST_F(DatabaseOpening, MissingFileFailsWithCouldNotFindFileNamingIt) {
    std::string description;
    EXPECT_EQ(ErrorOf([&] { Database::Open(file()); }, &description), err::CouldNotFindFile);
    EXPECT_EQ(description, "Could not find file '" + file().string() + "'.");
    EXPECT_FALSE(fs::exists(file())) << "opening must not create the file";
}

TEST_F(DatabaseOpening, FileThatIsNotADatabaseFailsWithUnrecognizedFormat) {
    std::ofstream(file()) << "Standard Jet DB, or anything else that is not SQLite, padded out "
                             "well beyond the length of a database header......................";
    EXPECT_EQ(ErrorOf([&] { Database::Open(file()); }), err::UnrecognizedDatabase);
}

TEST_F(DatabaseOpening, FolderInsteadOfFileIsNotFound) {
    fs::create_directory(file());
    EXPECT_EQ(ErrorOf([&] { Database::Open(file()); }), err::CouldNotFindFile);
}

TEST_F(DatabaseOpening, CreateMakesADatabaseAndRefusesAnExistingFile) {
    auto db = Database::Create(file());
    db->Execute("CREATE TABLE T (A TEXT)");
    db.reset();
    EXPECT_EQ(scalar("SELECT name FROM sqlite_master"), "T");
    std::string description;
    EXPECT_EQ(ErrorOf([&] { Database::Create(file()); }, &description), err::DatabaseExists);
    EXPECT_NE(description.find(file().string()), std::string::npos);
    EXPECT_EQ(scalar("SELECT name FROM sqlite_master"), "T") << "existing file was touched";
}

TEST_F(DatabaseOpening, CreatedFileIsADatabaseEvenBeforeAnyTable) {
    Database::Create(file());
    EXPECT_GT(fs::file_size(file()), 0u);
    EXPECT_NO_THROW(Database::Open(file()));
}

TEST_F(DatabaseOpening, CreateInAMissingFolderFailsAndLeavesNothing) {
    const fs::path nested = dir_.path() / "NoSuchFolder" / "x.mdb";
    EXPECT_NE(ErrorOf([&] { Database::Create(nested); }), 0);
    EXPECT_FALSE(fs::exists(nested.parent_path()));
}

TEST_F(DatabaseOpening, PathWithANulByteIsRefused) {
    const fs::path tricky = (dir_.path() / "Line1.mdb").string() + std::string("\0x", 2);
    EXPECT_NE(ErrorOf([&] { Database::Create(tricky); }), 0);
    EXPECT_FALSE(fs::exists(file()));
}

class DatabaseQueries : public DatabaseFile {
  protected:
    void SetUp() override {
        makeTagValues();
        db = Database::Open(file());
    }
    // The names a like pattern selects, in ID order, joined with commas.
    std::string namesLike(const std::string& pattern) {
        auto rs =
            db->OpenRecordset("select * from TagValues  where TagName like '" + pattern + "'");
        std::string names;
        for (int i = 0; i < rs->RecordCount(); ++i) {
            i == 0 ? rs->MoveFirst() : rs->MoveNext();
            names += (i ? "," : "") + rs->Fields("TagName").string();
        }
        return names;
    }
    std::unique_ptr<Database> db;
};

TEST_F(DatabaseQueries, LikeInQueriesIsTheEnginesLike) {
    EXPECT_EQ(namesLike("Lev*"), "Level,Level2");
    EXPECT_EQ(namesLike("level"), "Level");
    EXPECT_EQ(namesLike("Level#"), "Level2");
    EXPECT_EQ(namesLike("[FL]*"), "Level,Level2,Flow");
    EXPECT_EQ(namesLike("50%"), "50%");
    EXPECT_EQ(namesLike("%"), "") << "% is not a wildcard";
    EXPECT_EQ(namesLike("a_b"), "a_b");
    EXPECT_EQ(namesLike("O''Brien"), "O'Brien");
}

TEST_F(DatabaseQueries, NotLikeAndEscapeWork) {
    auto rs = db->OpenRecordset("select count(*) AS n from TagValues where TagName not like 'L*'");
    EXPECT_EQ(rs->Fields("n"), Variant(int32_t{4}));
    rs = db->OpenRecordset(
        "select count(*) AS n from TagValues where TagName like 'a!_b' escape '!'");
    EXPECT_EQ(rs->Fields("n"), Variant(int32_t{1}));
}

TEST_F(DatabaseQueries, MalformedLikePatternFailsTheQuery) {
    EXPECT_EQ(ErrorOf([&] { namesLike("Tank[1"); }), 93);
}

TEST_F(DatabaseQueries, QuoteInAValueIsASyntaxError) {
    std::string description;
    EXPECT_EQ(ErrorOf([&] { namesLike("O'Brien"); }, &description), err::QuerySyntax);
    EXPECT_NE(description.find("TagName like 'O'Brien'"), std::string::npos) << description;
    EXPECT_EQ(ErrorOf([&] { namesLike("a'b'c"); }), err::QuerySyntax);
}

TEST_F(DatabaseQueries, OnlyOneStatementEverRuns) {
    // A second statement smuggled in through a value: refused, and nothing of it runs.
    EXPECT_EQ(ErrorOf([&] { namesLike("x'; DELETE FROM TagValues; --"); }),
              err::CharactersAfterEnd);
    EXPECT_EQ(ErrorOf([&] {
                  db->Execute(
                      "UPDATE TagValues SET TagValue = 'x'; DROP TABLE "
                      "TagValues");
              }),
              err::CharactersAfterEnd);
    EXPECT_EQ(scalar("SELECT count(*) FROM TagValues"), "6");
    EXPECT_EQ(scalar("SELECT count(*) FROM TagValues WHERE TagValue = 'x'"), "0")
        << "the first statement ran although the text was refused";
    // Text after a NUL is hidden from the engine: refused as well.
    EXPECT_EQ(ErrorOf([&] {
                  db->OpenRecordset(std::string("select * from TagValues\0; DROP TABLE T", 38));
              }),
              err::CharactersAfterEnd);
}

TEST_F(DatabaseQueries, TrailingBlanksCommentsAndSemicolonAreNotASecondStatement) {
    EXPECT_EQ(db->OpenRecordset("select * from TagValues ")->RecordCount(), 6);
    EXPECT_EQ(db->OpenRecordset("select * from TagValues;  ")->RecordCount(), 6);
    EXPECT_EQ(db->OpenRecordset("select * from TagValues -- all of them\n")->RecordCount(), 6);
}

TEST_F(DatabaseQueries, AttachingAnotherFileIsRefused) {
    const fs::path outside = dir_.path() / "other.db";
    EXPECT_NE(ErrorOf([&] { db->Execute("ATTACH DATABASE '" + outside.string() + "' AS o"); }), 0);
    EXPECT_FALSE(fs::exists(outside));
}

TEST_F(DatabaseQueries, ErrorsCarryTheEnginesNumbers) {
    std::string description;
    EXPECT_EQ(ErrorOf([&] { db->OpenRecordset("select * from Nodes "); }, &description),
              err::TableNotFound);
    EXPECT_NE(description.find("'Nodes'"), std::string::npos) << description;
    EXPECT_EQ(ErrorOf([&] { db->OpenRecordset("select * fron TagValues"); }), err::QuerySyntax);
    EXPECT_EQ(ErrorOf([&] { db->OpenRecordset("select Nope from TagValues"); }), 3061);
    EXPECT_EQ(ErrorOf([&] { db->OpenRecordset("DELETE FROM TagValues"); }), 3219);
    EXPECT_EQ(ErrorOf([&] { db->Execute("select * from TagValues"); }), 3065);
    EXPECT_EQ(ErrorOf([&] { db->Execute("   "); }), 3129);
    EXPECT_EQ(scalar("SELECT count(*) FROM TagValues"), "6");
}

TEST_F(DatabaseQueries, ValuesComeAsTheDatabaseDeliversThem) {
    sql("CREATE TABLE V (I INTEGER, Big INTEGER, R REAL, T TEXT, N TEXT, B BLOB);"
        "INSERT INTO V VALUES (-7, 5000000000, 2.5, '12.5', NULL, x'00ff41');");
    auto rs = db->OpenRecordset("select * from V");
    EXPECT_EQ(rs->Fields("I"), Variant(int32_t{-7}));
    EXPECT_EQ(rs->Fields("Big"), Variant(5000000000.0));
    EXPECT_EQ(rs->Fields("R"), Variant(2.5));
    EXPECT_EQ(rs->Fields("T"), Variant("12.5"));
    EXPECT_TRUE(rs->Fields("N").isNull());
    EXPECT_EQ(rs->Fields("B"), Variant(std::string("\0\xff"
                                                   "A",
                                                   3)));
    EXPECT_EQ(rs->Fields("t"), Variant("12.5")) << "field names are not case-sensitive";
}

TEST_F(DatabaseQueries, RecordsetMayOutliveItsDatabase) {
    auto rs = db->OpenRecordset("select * from TagValues where TagName like 'Flow'");
    db.reset();
    rs->Edit();
    rs->setField("TagValue", Variant("55"));
    rs->Update();
    EXPECT_EQ(scalar("SELECT TagValue FROM TagValues WHERE TagName = 'Flow'"), "55");
}

TEST_F(DatabaseQueries, SecondConnectionWaitsForALockInsteadOfFailing) {
    // Another connection holds a write lock briefly; our update waits for it.
    sqlite3* other = nullptr;
    sqlite3_open(file().c_str(), &other);
    sqlite3_exec(other, "BEGIN IMMEDIATE; UPDATE TagValues SET TagValue = 'o' WHERE ID = 1;",
                 nullptr, nullptr, nullptr);
    auto rs = db->OpenRecordset("select * from TagValues where TagName like 'Flow'");
    std::thread release([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        sqlite3_exec(other, "COMMIT", nullptr, nullptr, nullptr);
    });
    rs->Edit();
    rs->setField("TagValue", Variant("w"));
    EXPECT_NO_THROW(rs->Update());
    release.join();
    sqlite3_close(other);
    EXPECT_EQ(scalar("SELECT TagValue FROM TagValues WHERE TagName = 'Flow'"), "w");
    EXPECT_EQ(scalar("SELECT TagValue FROM TagValues WHERE ID = 1"), "o");
}

}  // namespace
}  // namespace maroset::platform
