#pragma once

#include <filesystem>
#include <memory>
#include <string>

#include "platform/Recordset.h"

struct sqlite3;

namespace maroset::platform {

// A database file, opened as the system opened its Jet databases: shared, read-write. On
// Linux the files are SQLite files. Every connection has the original engine's `like`
// registered as SQLite's like(): `*` any run of characters, `?` one character, `#` one digit,
// `[list]` / `[!list]` one character in / not in the list (ranges allowed), case-insensitive;
// `%` and `_` are ordinary characters.
//
// Statements run one at a time: text after the first statement fails with Characters found
// after end of SQL statement (3142) and nothing runs. Failures are VbErrors with the engine's
// numbers: 3024 Could not find file, 3078 input table or query not found, 3075 syntax error in
// query expression, 3265 Item not found in this collection, 3343 Unrecognized database format.
class Database {
public:
    // Opens an existing file (3024 when it does not exist).
    static std::unique_ptr<Database> Open(const std::filesystem::path& file);
    // Creates a new, empty file (3204 Database already exists when it does).
    static std::unique_ptr<Database> Create(const std::filesystem::path& file);

    ~Database();
    Database(const Database&) = delete;
    Database& operator=(const Database&) = delete;

    // Runs one query and returns its rows. Rows of a query on one table can be edited and
    // added through the recordset.
    std::unique_ptr<Recordset> OpenRecordset(const std::string& sql);
    // Runs one statement that returns no rows (table and index definitions, updates).
    void Execute(const std::string& sql);

    const std::filesystem::path& file() const { return file_; }

private:
    Database(sqlite3* db, std::filesystem::path file);
    sqlite3* db_;
    std::filesystem::path file_;
};

}  // namespace maroset::platform
