#pragma once

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "lang/Variant.h"
#include "platform/Recordset.h"

namespace maroset::platform {

class SqliteConnection;

// A database file, opened as the system opened its Jet databases: shared, read-write. On
// Linux the files are SQLite files. Every connection has the original engine's `like`
// registered as SQLite's like() (see JetLike.h): `*` any run of characters, `?` one character,
// `#` one digit, `[list]` / `[!list]` one character in / not in the list (ranges allowed),
// case-insensitive; `%` and `_` are ordinary characters. So the system's queries run as
// written: "select * from TagValues  where TagName like 'Lev*'".
//
// Statements run one at a time: text after the first statement fails with Characters found
// after end of SQL statement (3142) and nothing runs. Failures are VbErrors with the engine's
// numbers: 3024 Could not find file, 3078 input table or query not found (naming the table),
// 3075 syntax error in query expression, 3061 unknown name in a query, 3343 Unrecognized
// database format, 3204 Database already exists, 3044 not a valid path, 93 Invalid pattern
// string (a malformed like pattern).
//
// A connection waits up to a few seconds for another connection's lock, so two connections to
// one file (two processes, or a handler that opens the file while the caller has it open) do
// not fail spuriously. Each write is committed, and synced, before the call that made it
// returns.
//
// Paths are native paths; the caller maps drive C: (FileSystem::resolve) first.
class Database {
  public:
    // Opens an existing file (3024 when it does not exist).
    static std::unique_ptr<Database> Open(const std::filesystem::path& file);
    // Creates a new, empty database file (3204 when the file exists, 3044 when its folder
    // does not).
    static std::unique_ptr<Database> Create(const std::filesystem::path& file);

    ~Database();
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    // Runs one query and returns its rows. Rows of a query on one table can be edited and
    // added through the recordset. A statement that changes data fails with Invalid operation
    // (3219).
    std::unique_ptr<Recordset> OpenRecordset(const std::string& sql);
    // Runs one statement that returns no rows (table and index definitions, updates). A query
    // fails with Cannot execute a select query (3065).
    void Execute(const std::string& sql);
    // The same with `?` parameters bound to values, so no value is ever spliced into the
    // statement's text: integers, Booleans and dates as integers, Single and Double as reals,
    // text as text, Empty and Null as NULL.
    void Execute(const std::string& sql, const std::vector<Variant>& parameters);

    const std::filesystem::path& file() const;

  private:
    explicit Database(std::shared_ptr<SqliteConnection> connection);
    std::shared_ptr<SqliteConnection> connection_;
};

}  // namespace maroset::platform
