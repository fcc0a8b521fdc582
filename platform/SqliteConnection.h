#pragma once

#include <sqlite3.h>

#include <cstdint>
#include <filesystem>
#include <memory>
#include <string>
#include <string_view>

#include "lang/Variant.h"
#include "lang/VbError.h"

namespace maroset::platform {

// Error numbers of the original database engine beyond those in lang/VbError.h.
namespace dberr {
inline constexpr int32_t ReservedError = 3000;
inline constexpr int32_t UpdateWithoutAddNewOrEdit = 3020;
inline constexpr int32_t DuplicateValues = 3022;
inline constexpr int32_t ReadOnly = 3027;
inline constexpr int32_t DiskOrNetworkError = 3043;
inline constexpr int32_t NotAValidPath = 3044;
inline constexpr int32_t CorruptFile = 3049;
inline constexpr int32_t CannotOpenFile = 3051;
inline constexpr int32_t TooFewParameters = 3061;
inline constexpr int32_t CannotExecuteSelect = 3065;
inline constexpr int32_t TableExists = 3010;
inline constexpr int32_t InvalidSqlStatement = 3129;
inline constexpr int32_t RecordIsDeleted = 3167;
inline constexpr int32_t CouldNotUpdateLocked = 3218;
inline constexpr int32_t InvalidOperation = 3219;
inline constexpr int32_t FieldCannotBeNull = 3314;
inline constexpr int32_t IndexExists = 3375;
}  // namespace dberr

// One SQLite connection shared by a Database and the recordsets opened on it, so either may
// be released first. Internal to the database seam.
class SqliteConnection {
  public:
    struct Finalizer {
        void operator()(sqlite3_stmt* s) const { sqlite3_finalize(s); }
    };
    using Statement = std::unique_ptr<sqlite3_stmt, Finalizer>;

    // Takes ownership of an open handle and sets it up as all our connections are: the
    // engine's like(), a busy timeout, full synchronous writes, no ATTACH.
    SqliteConnection(sqlite3* db, std::filesystem::path file);
    ~SqliteConnection();
    SqliteConnection(const SqliteConnection&) = delete;
    SqliteConnection& operator=(const SqliteConnection&) = delete;

    sqlite3* handle() const { return db_; }
    const std::filesystem::path& file() const { return file_; }

    // Prepares the one statement `sql` holds; anything but blanks, comments and semicolons
    // after it fails with 3142 before anything runs.
    Statement Prepare(std::string_view sql) const;
    // One step: true for a row, false when done; failures as VbErrors.
    bool Step(sqlite3_stmt* statement, std::string_view sql) const;
    // Runs a statement of our own that returns no rows.
    void Run(std::string_view sql) const;

    // The VbError for the connection's last failure (`rc`) while running `sql`.
    [[noreturn]] void Fail(int rc, std::string_view sql) const;

    // How long a statement waits for another connection's lock before it fails.
    static constexpr int BusyTimeoutMs = 5000;

  private:
    sqlite3* db_;
    std::filesystem::path file_;
};

// The value of column `i` of the current row as the system delivers it: integers as Long
// (Double beyond 32 bits), reals as Double, text as String, NULL as Null, binary data as a
// String of its bytes.
Variant ReadColumn(sqlite3_stmt* statement, int i);

// A name quoted as an SQL identifier.
std::string QuoteIdentifier(std::string_view name);
// ASCII case-insensitive equality, as the engine compares field and table names.
bool NamesEqual(std::string_view a, std::string_view b);

}  // namespace maroset::platform
