#include "platform/Database.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <fstream>
#include <thread>

#include "database/ProjectDatabase.h"
#include "support/ErrorOf.h"

namespace maroset::platform {
namespace {

namespace fs = std::filesystem;
using test::errorOf;
using ::testing::HasSubstr;
using ::testing::ThrowsMessage;

using DatabaseOpening = ProjectDatabase;

TEST_F(DatabaseOpening, OnlyAnExistingDatabaseOpensAndCreateNeverOverwrites) {
    const fs::path missing = dir_.path() / "Gone.mdb", text = dir_.path() / "Text.mdb";
    const fs::path created = dir_.path() / "New.mdb", nested = dir_.path() / "No" / "x.mdb";
    EXPECT_EQ(errorOf([&] { Database::Open(missing); }), err::CouldNotFindFile);
    EXPECT_THAT([&] { Database::Open(missing); },
                ThrowsMessage<VbError>("Could not find file '" + missing.string() + "'."));
    EXPECT_FALSE(fs::exists(missing));
    fs::create_directory(missing);
    EXPECT_EQ(errorOf([&] { Database::Open(missing); }), err::CouldNotFindFile);
    std::ofstream(text) << std::string(200, 'x');
    EXPECT_EQ(errorOf([&] { Database::Open(text); }), err::UnrecognizedDatabase);
    EXPECT_NE(errorOf([&] { Database::Create(created.string() + std::string("\0x", 2)); }), 0);
    EXPECT_FALSE(fs::exists(created));
    Database::Create(created);
    EXPECT_GT(fs::file_size(created), 0u) << "a database even before any table";
    EXPECT_EQ(errorOf([&] { Database::Create(file()); }), err::DatabaseExists);
    EXPECT_THAT([&] { Database::Create(file()); }, ThrowsMessage<VbError>(HasSubstr(file())));
    EXPECT_EQ(fresh("select count(*) from TagValues"), Variant(4)) << "existing file touched";
    EXPECT_NE(errorOf([&] { Database::Create(nested); }), 0);
    EXPECT_FALSE(fs::exists(nested.parent_path()));
}

TEST_F(DatabaseOpening, CreatedFileAppearsWholeAndOnlyABlankFileIsReplaced) {
    const fs::path made = dir_.path() / "Made.mdb", text = dir_.path() / "Text.mdb";
    Database::Create(made, {"CREATE TABLE T (A TEXT)", "CREATE INDEX TA ON T (A)"});
    EXPECT_EQ(Database::Open(made)->OpenRecordset("select count(*) as N from T")->Fields("N"), Variant(0));
    // A schema that fails leaves neither the file nor the one it was built in.
    EXPECT_EQ(errorOf([&] { Database::Create(dir_.path() / "Bad.mdb", {"CREATE TABLE T"}); }),
              err::QuerySyntax);
    std::vector<std::string> names;
    for (const auto& entry : fs::directory_iterator(dir_.path()))
        names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    EXPECT_EQ(names, (std::vector<std::string>{"Line1.mdb", "Made.mdb"}));

    std::ofstream(text) << std::string(200, 'x');
    EXPECT_FALSE(Database::Blank(text)) << "not a database: not ours to replace";
    EXPECT_FALSE(Database::Blank(made));
    EXPECT_FALSE(Database::Blank(dir_.path() / "Gone.mdb"));
    fs::resize_file(made, 0);
    EXPECT_TRUE(Database::Blank(made));
    Database::Create(made);  // the header only, as a creation cut short left it
    EXPECT_TRUE(Database::Blank(made));
    Database::Create(made, {"CREATE TABLE T (A TEXT)"});
    EXPECT_EQ(errorOf([&] { Database::Create(made); }), err::DatabaseExists);
}

class DatabaseQueries : public ProjectDatabase {
  protected:
    // The names a like pattern selects, in ID order, joined with commas.
    std::string namesLike(const std::string& pattern) {
        auto rs = db->OpenRecordset("select * from TagValues where TagName like '" + pattern + "'");
        std::string names;
        for (; !rs->eof(); rs->MoveNext()) names += rs->Fields("TagName").string() + ";";
        return names;
    }
    std::unique_ptr<Database> db = Database::Open(file());
};

TEST_F(DatabaseQueries, LikeInQueriesIsTheEnginesLike) {
    // Star, case, % and _ are checked through the disk tag driver.
    const std::pair<const char*, const char*> rows[] = {
        {"Level#", "Level2;"}, {"[af]low", "Flow;"}, {"%", ""}, {"O''Brien", "O'Brien;"}};
    for (const auto& [pattern, names] : rows) EXPECT_EQ(namesLike(pattern), names) << pattern;
    EXPECT_EQ(fresh("select count(*) from TagValues where TagName like 'L*!2' escape '!'"),
              Variant(1));
    EXPECT_EQ(errorOf([&] { namesLike("Tank[1"); }), 93);
    // A quote in a value is a syntax error that names the expression.
    EXPECT_THAT([&] { namesLike("O'Brien"); },
                ThrowsMessage<VbError>(HasSubstr("TagName like 'O'Brien'")));
}

TEST_F(DatabaseQueries, OnlyOneStatementEverRuns) {
    // A second statement (one smuggled in through a value is checked through the disk tag
    // driver) or text hidden after a NUL is refused, and nothing of the text runs; trailing
    // blanks, a comment or a semicolon are no statement.
    EXPECT_EQ(errorOf([&] { db->Execute("UPDATE TagValues SET TagValue = 'x'; DROP TABLE T"); }),
              err::CharactersAfterEnd);
    const std::string hidden("select * from TagValues\0; DROP TABLE T", 38);
    EXPECT_EQ(errorOf([&] { db->OpenRecordset(hidden); }), err::CharactersAfterEnd);
    EXPECT_EQ(fresh("select count(*) from TagValues where TagValue <> 'x'"), Variant(4));
    for (const char* tail : {" ", ";  ", " -- all of them\n"})
        EXPECT_EQ(fresh(std::string("select count(*) from TagValues") + tail), Variant(4));
}

TEST_F(DatabaseQueries, ErrorsCarryTheEnginesNumbers) {
    EXPECT_EQ(errorOf([&] { db->OpenRecordset("select * from Tags "); }), err::TableNotFound);
    EXPECT_THAT([&] { db->OpenRecordset("select * from Tags "); },
                ThrowsMessage<VbError>(HasSubstr("'Tags'")));
    EXPECT_EQ(errorOf([&] { db->OpenRecordset("select * fron TagValues"); }), err::QuerySyntax);
    EXPECT_EQ(errorOf([&] { db->OpenRecordset("select Nope from TagValues"); }), 3061);
    EXPECT_EQ(errorOf([&] { db->OpenRecordset("DELETE FROM TagValues"); }), 3219);
    const fs::path outside = dir_.path() / "other.db";
    EXPECT_NE(errorOf([&] { db->Execute("ATTACH DATABASE '" + outside.string() + "' AS o"); }), 0);
    EXPECT_FALSE(fs::exists(outside));
    EXPECT_EQ(fresh("select count(*) from TagValues"), Variant(4));
}

TEST_F(DatabaseQueries, WriteWaitsForAnotherConnectionsLockInsteadOfFailing) {
    auto other = Database::Open(file());
    other->Execute("BEGIN IMMEDIATE");
    std::thread release([&] {
        std::this_thread::sleep_for(std::chrono::milliseconds(200));
        other->Execute("COMMIT");
    });
    EXPECT_NO_THROW(db->Execute("UPDATE TagValues SET TagValue = 'w' WHERE TagName = 'Flow'"));
    release.join();
    EXPECT_EQ(fresh("select TagValue from TagValues where TagName = 'Flow'"), Variant("w"));
}

}  // namespace
}  // namespace maroset::platform
