#include "platform/SqliteConnection.h"

#include <optional>

#include "lang/Variant.h"
#include "platform/JetLike.h"

namespace maroset::platform {
namespace {

// like(pattern, text[, escape]): SQLite calls this for `text LIKE pattern [ESCAPE e]`.
void LikeFunction(sqlite3_context* ctx, int argc, sqlite3_value** argv) {
    if (argc != 2 && argc != 3)
        return sqlite3_result_error(ctx, "wrong number of arguments to function like()", -1);
    for (int i = 0; i < argc; ++i)
        if (sqlite3_value_type(argv[i]) == SQLITE_NULL) return sqlite3_result_null(ctx);
    std::optional<char> escape;
    if (argc == 3) {
        const auto* e = sqlite3_value_text(argv[2]);
        if (sqlite3_value_bytes(argv[2]) != 1)
            return sqlite3_result_error(ctx, "ESCAPE expression must be a single character", -1);
        escape = static_cast<char>(e[0]);
    }
    // sqlite3_value_text before sqlite3_value_bytes, as SQLite asks.
    const auto* p = reinterpret_cast<const char*>(sqlite3_value_text(argv[0]));
    const std::string_view pattern(p ? p : "", static_cast<size_t>(sqlite3_value_bytes(argv[0])));
    const auto* t = reinterpret_cast<const char*>(sqlite3_value_text(argv[1]));
    const std::string_view text(t ? t : "", static_cast<size_t>(sqlite3_value_bytes(argv[1])));
    // The pattern is usually the same for every row: SQLite keeps what was learnt about it
    // (that it is a plain name) for as long as it stays the same. Not with ESCAPE, whose
    // character could change from row to row.
    static char plain;
    bool isPlain = argc == 2 && sqlite3_get_auxdata(ctx, 0) == &plain;
    if (!isPlain && argc == 2 && JetPlainPattern(pattern)) {
        sqlite3_set_auxdata(ctx, 0, &plain, nullptr);
        isPlain = true;
    }
    if (isPlain) return sqlite3_result_int(ctx, JetSameText(text, pattern) ? 1 : 0);
    try {
        sqlite3_result_int(ctx, JetLike(text, pattern, escape) ? 1 : 0);
    } catch (const VbError& e) {
        sqlite3_result_error(ctx, e.description().c_str(), -1);
    }
}

// The system never attaches other files; refusing ATTACH keeps every query on its own file.
int Authorize(void*, int action, const char*, const char*, const char*, const char*) {
    return action == SQLITE_ATTACH || action == SQLITE_DETACH ? SQLITE_DENY : SQLITE_OK;
}

bool StartsWith(std::string_view s, std::string_view prefix) {
    return s.substr(0, prefix.size()) == prefix;
}

// "no such table: main.Nodes" -> "Nodes"
std::string AfterColon(std::string_view message, std::string_view prefix) {
    std::string_view name = message.substr(prefix.size());
    if (StartsWith(name, "main.")) name.remove_prefix(5);
    return std::string(name);
}

// The expression a syntax error is reported in: what follows " where ", or the whole text.
std::string QueryExpression(std::string_view sql) {
    for (size_t i = 0; i + 7 <= sql.size(); ++i)
        if (NamesEqual(sql.substr(i, 7), " where ")) {
            std::string_view expr = sql.substr(i + 7);
            while (!expr.empty() && expr.front() == ' ') expr.remove_prefix(1);
            return std::string(expr);
        }
    return std::string(sql);
}

}  // namespace

SqliteConnection::SqliteConnection(sqlite3* db, std::filesystem::path file)
    : db_(db), file_(std::move(file)) {
    sqlite3_extended_result_codes(db_, 1);
    sqlite3_busy_timeout(db_, BusyTimeoutMs);
    const int flags = SQLITE_UTF8 | SQLITE_DETERMINISTIC | SQLITE_INNOCUOUS;
    // One registration for both forms (with and without ESCAPE): every connection pays for it.
    sqlite3_create_function_v2(db_, "like", -1, flags, nullptr, LikeFunction, nullptr, nullptr,
                               nullptr);
    sqlite3_set_authorizer(db_, Authorize, nullptr);
}

SqliteConnection::~SqliteConnection() {
    sqlite3_close_v2(db_);
}

SqliteConnection::Statement SqliteConnection::Prepare(std::string_view sql) const {
    // A NUL would end the text the engine sees and hide whatever follows it.
    if (sql.find('\0') != std::string_view::npos)
        throw VbError(err::CharactersAfterEnd, "Characters found after end of SQL statement.");
    sqlite3_stmt* raw = nullptr;
    const char* tail = nullptr;
    const int rc = sqlite3_prepare_v2(db_, sql.data(), static_cast<int>(sql.size()), &raw, &tail);
    if (rc != SQLITE_OK) Fail(rc, sql);
    Statement statement(raw);
    if (!statement)
        throw VbError(dberr::InvalidSqlStatement,
                      "Invalid SQL statement; expected 'DELETE', 'INSERT', 'PROCEDURE', "
                      "'SELECT', or 'UPDATE'.");
    // Whatever follows must compile to nothing (blanks, comments, semicolons). Preparing it
    // runs nothing; a second statement, or text that is not SQL at all, refuses the whole.
    const char* end = sql.data() + sql.size();
    while (tail < end) {
        sqlite3_stmt* next = nullptr;
        const char* after = nullptr;
        const int rc2 = sqlite3_prepare_v2(db_, tail, static_cast<int>(end - tail), &next, &after);
        const bool more = rc2 != SQLITE_OK || next != nullptr;
        sqlite3_finalize(next);
        if (more)
            throw VbError(err::CharactersAfterEnd, "Characters found after end of SQL statement.");
        if (after <= tail) break;
        tail = after;
    }
    return statement;
}

bool SqliteConnection::Step(sqlite3_stmt* statement, std::string_view sql) const {
    const int rc = sqlite3_step(statement);
    if (rc == SQLITE_ROW) return true;
    if (rc == SQLITE_DONE) return false;
    Fail(rc, sql);
}

void SqliteConnection::Run(std::string_view sql) const {
    Statement statement = Prepare(sql);
    while (Step(statement.get(), sql)) {
    }
}

void SqliteConnection::Fail(int rc, std::string_view sql) const {
    const std::string message = sqlite3_errmsg(db_);
    const std::string file = file_.string();
    switch (rc & 0xFF) {
        case SQLITE_NOTADB:
            throw VbError(err::UnrecognizedDatabase,
                          "Unrecognized database format '" + file + "'.");
        case SQLITE_CORRUPT:
            throw VbError(dberr::CorruptFile, "Cannot open database '" + file +
                                                  "'. It may not be a database that your "
                                                  "application recognizes, or the file may be "
                                                  "corrupt.");
        case SQLITE_BUSY:
        case SQLITE_LOCKED:
            throw VbError(dberr::CouldNotUpdateLocked, "Could not update; currently locked.");
        case SQLITE_READONLY:
            throw VbError(dberr::ReadOnly, "Cannot update. Database or object is read-only.");
        case SQLITE_IOERR:
        case SQLITE_FULL:
            throw VbError(dberr::DiskOrNetworkError, "Disk or network error.");
        case SQLITE_CANTOPEN:
        case SQLITE_PERM:
            throw VbError(dberr::CannotOpenFile,
                          "The database engine cannot open the file '" + file +
                              "'. It is already opened exclusively by another user, or you "
                              "need permission to view its data.");
        case SQLITE_CONSTRAINT:
            if (rc == SQLITE_CONSTRAINT_NOTNULL) {
                // "NOT NULL constraint failed: T.F"
                const auto dot = message.rfind('.');
                const std::string field =
                    dot == std::string::npos ? message : message.substr(dot + 1);
                throw VbError(dberr::FieldCannotBeNull,
                              "The field '" + field + "' cannot contain a Null value.");
            }
            throw VbError(dberr::DuplicateValues,
                          "The changes you requested to the table were not successful because "
                          "they would create duplicate values in the index, primary key, or "
                          "relationship.");
        default:
            break;
    }
    if (StartsWith(message, "no such table: ")) {
        const std::string table = AfterColon(message, "no such table: ");
        throw VbError(err::TableNotFound,
                      "The database engine cannot find the input table or query '" + table +
                          "'. Make sure it exists and that its name is spelled correctly.");
    }
    if (StartsWith(message, "no such column: "))
        throw VbError(dberr::TooFewParameters, "Too few parameters. Expected 1.");
    if (StartsWith(message, "unrecognized token: "))
        throw VbError(err::QuerySyntax,
                      "Syntax error in string in query expression '" + QueryExpression(sql) + "'.");
    if (message.find("syntax error") != std::string::npos || message == "incomplete input")
        throw VbError(err::QuerySyntax, "Syntax error (missing operator) in query expression '" +
                                            QueryExpression(sql) + "'.");
    if (message.find("Invalid pattern string") != std::string::npos)
        throw VbError(InvalidPatternString, "Invalid pattern string");
    if (StartsWith(message, "table ") && message.find(" already exists") != std::string::npos) {
        // "table TagValues already exists"
        const std::string table = message.substr(6, message.find(" already exists") - 6);
        throw VbError(dberr::TableExists, "Table '" + table + "' already exists.");
    }
    if (StartsWith(message, "index ") && message.find(" already exists") != std::string::npos) {
        const std::string index = message.substr(6, message.find(" already exists") - 6);
        throw VbError(dberr::IndexExists, "The table already has an index named '" + index + "'.");
    }
    // Anything else keeps the engine's own words.
    throw VbError(dberr::ReservedError, message);
}

Variant ReadColumn(sqlite3_stmt* s, int i) {
    switch (sqlite3_column_type(s, i)) {
        case SQLITE_INTEGER: {
            const sqlite3_int64 v = sqlite3_column_int64(s, i);
            if (v >= INT32_MIN && v <= INT32_MAX) return Variant(static_cast<int32_t>(v));
            return Variant(static_cast<double>(v));
        }
        case SQLITE_FLOAT:
            return Variant(sqlite3_column_double(s, i));
        case SQLITE_TEXT: {
            const auto* p = reinterpret_cast<const char*>(sqlite3_column_text(s, i));
            return Variant(std::string(p, static_cast<size_t>(sqlite3_column_bytes(s, i))));
        }
        case SQLITE_BLOB: {
            const auto* p = static_cast<const char*>(sqlite3_column_blob(s, i));
            const auto n = static_cast<size_t>(sqlite3_column_bytes(s, i));
            return Variant(p ? std::string(p, n) : std::string());
        }
        default:
            return Variant::Null();
    }
}

std::string QuoteIdentifier(std::string_view name) {
    std::string quoted = "\"";
    for (char c : name) {
        if (c == '"') quoted += '"';
        quoted += c;
    }
    return quoted + '"';
}

bool NamesEqual(std::string_view a, std::string_view b) {
    if (a.size() != b.size()) return false;
    for (size_t i = 0; i < a.size(); ++i) {
        char x = a[i], y = b[i];
        if (x >= 'A' && x <= 'Z') x = static_cast<char>(x + 32);
        if (y >= 'A' && y <= 'Z') y = static_cast<char>(y + 32);
        if (x != y) return false;
    }
    return true;
}

}  // namespace maroset::platform
