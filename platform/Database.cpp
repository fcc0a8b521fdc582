#include "platform/Database.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>
#include <system_error>

#include "platform/SqliteConnection.h"

namespace maroset::platform {
namespace {

namespace fs = std::filesystem;

void RefuseNul(const fs::path& file) {
    // SQLite would stop at the NUL and open some other file.
    if (file.native().find('\0') != std::string::npos)
        throw VbError(dberr::NotAValidPath, "'" + file.string() +
                                                "' is not a valid path. Make sure that the "
                                                "path name is spelled correctly.");
}

std::shared_ptr<SqliteConnection> Connect(const fs::path& file) {
    sqlite3* db = nullptr;
    const int rc = sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    auto connection = std::make_shared<SqliteConnection>(db, file);
    if (rc != SQLITE_OK) connection->Fail(rc, "");
    // Each write is on the disk before the call that made it returns.
    connection->Run("PRAGMA synchronous = FULL");
    return connection;
}

// SQLite reads nothing until the first statement: look at the schema now so that a file that
// is not a database fails here, as the original engine failed on opening it.
void CheckFormat(const SqliteConnection& connection) {
    connection.Run("SELECT count(*) FROM sqlite_master");
}

void SyncFolder(const fs::path& folder) {
    const int fd =
        ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd < 0) return;
    ::fsync(fd);
    ::close(fd);
}

}  // namespace

std::unique_ptr<Database> Database::Open(const fs::path& file) {
    RefuseNul(file);
    std::error_code ec;
    if (!fs::is_regular_file(file, ec))
        throw VbError(err::CouldNotFindFile, "Could not find file '" + file.string() + "'.");
    auto connection = Connect(file);
    CheckFormat(*connection);
    return std::unique_ptr<Database>(new Database(std::move(connection)));
}

std::unique_ptr<Database> Database::Create(const fs::path& file) {
    RefuseNul(file);
    // Create the file exclusively ourselves, so two creators cannot both think they made it.
    const int fd = ::open(file.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
    if (fd < 0) {
        const int error = errno;
        if (error == EEXIST)
            throw VbError(err::DatabaseExists, "Database '" + file.string() + "' already exists.");
        if (error == EACCES || error == EPERM || error == EROFS)
            throw VbError(dberr::CannotOpenFile,
                          "The database engine cannot open the file '" + file.string() +
                              "'. It is already opened exclusively by another user, or you "
                              "need permission to view its data.");
        throw VbError(dberr::NotAValidPath, "'" + file.parent_path().string() +
                                                "' is not a valid path. Make sure that the "
                                                "path name is spelled correctly.");
    }
    ::close(fd);
    try {
        auto connection = Connect(file);
        // Write the header now, so the new file is a database from the start.
        connection->Run("PRAGMA application_id = 1296126803");  // "MRSS"
        SyncFolder(file.parent_path());
        return std::unique_ptr<Database>(new Database(std::move(connection)));
    } catch (...) {
        // No half-made file stays behind to be taken for a database later.
        std::error_code ec;
        fs::remove(file, ec);
        throw;
    }
}

Database::Database(std::shared_ptr<SqliteConnection> connection)
    : connection_(std::move(connection)) {}

Database::~Database() = default;

const fs::path& Database::file() const {
    return connection_->file();
}

void Database::Execute(const std::string& sql) {
    auto statement = connection_->Prepare(sql);
    if (sqlite3_column_count(statement.get()) > 0 && sqlite3_stmt_readonly(statement.get()))
        throw VbError(dberr::CannotExecuteSelect, "Cannot execute a select query.");
    while (connection_->Step(statement.get(), sql)) {
    }
}

std::unique_ptr<Recordset> Database::OpenRecordset(const std::string& sql) {
    auto statement = connection_->Prepare(sql);
    sqlite3_stmt* s = statement.get();
    const int count = sqlite3_column_count(s);
    if (count == 0 || !sqlite3_stmt_readonly(s))
        throw VbError(dberr::InvalidOperation, "Invalid operation.");

    std::vector<std::string> names;
    for (int i = 0; i < count; ++i) names.emplace_back(sqlite3_column_name(s, i));
    std::unique_ptr<Recordset> rs(new Recordset(connection_, std::move(names)));

    // Rows can be changed when every field is a column of one table of this file, each
    // column once (a join of a table with itself is not).
    std::string table;
    bool oneTable = true;
    for (int i = 0; i < count && oneTable; ++i) {
        const char* db = sqlite3_column_database_name(s, i);
        const char* t = sqlite3_column_table_name(s, i);
        const char* origin = sqlite3_column_origin_name(s, i);
        if (!db || !t || !origin || std::string_view(db) != "main" || (i > 0 && table != t)) {
            oneTable = false;
            break;
        }
        table = t;
        for (const auto& seen : rs->origins_)
            if (NamesEqual(seen, origin)) oneTable = false;
        rs->origins_.emplace_back(origin);
        // The column affinity rules of SQLite, from the declared type.
        std::string type = sqlite3_column_decltype(s, i) ? sqlite3_column_decltype(s, i) : "";
        for (char& c : type)
            if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 32);
        auto has = [&](const char* part) { return type.find(part) != std::string::npos; };
        Recordset::Affinity a = Recordset::Affinity::Numeric;
        if (has("INT"))
            a = Recordset::Affinity::Numeric;
        else if (has("CHAR") || has("CLOB") || has("TEXT"))
            a = Recordset::Affinity::Text;
        else if (type.empty())
            a = Recordset::Affinity::None;
        else if (has("BLOB"))
            a = Recordset::Affinity::Blob;
        rs->affinities_.push_back(a);
    }
    if (oneTable && count > 0) {
        // Rows are identified by rowid: a field that is the table's INTEGER PRIMARY KEY
        // carries it; otherwise a row is found again by its values when it is first changed.
        // A table without rowids cannot be changed through a recordset.
        auto info = connection_->Prepare(
            "SELECT name, type, pk, (SELECT count(*) FROM pragma_table_info(?1) WHERE pk > 0) "
            "FROM pragma_table_info(?1) WHERE pk = 1");
        sqlite3_bind_text(info.get(), 1, table.data(), static_cast<int>(table.size()),
                          SQLITE_TRANSIENT);
        if (connection_->Step(info.get(), "")) {
            const std::string name =
                reinterpret_cast<const char*>(sqlite3_column_text(info.get(), 0));
            const std::string type =
                reinterpret_cast<const char*>(sqlite3_column_text(info.get(), 1));
            if (sqlite3_column_int(info.get(), 3) == 1 && NamesEqual(type, "INTEGER")) {
                rs->rowidName_ = name;
                for (int i = 0; i < count; ++i)
                    if (NamesEqual(rs->origins_[static_cast<size_t>(i)], name)) rs->rowidField_ = i;
            }
        }
        sqlite3_stmt* probe = nullptr;
        const std::string sql2 = "SELECT rowid FROM " + QuoteIdentifier(table) + " LIMIT 0";
        const bool hasRowid = sqlite3_prepare_v2(connection_->handle(), sql2.c_str(), -1, &probe,
                                                 nullptr) == SQLITE_OK;
        sqlite3_finalize(probe);
        if (hasRowid) rs->table_ = table;
    }
    if (rs->table_.empty()) {
        rs->origins_.clear();
        rs->affinities_.clear();
    }

    while (connection_->Step(s, sql)) {
        Recordset::Row row;
        for (int i = 0; i < count; ++i) {
            row.storage.push_back(static_cast<uint8_t>(sqlite3_column_type(s, i)));
            row.values.push_back(ReadColumn(s, i));
        }
        if (rs->rowidField_ >= 0 &&
            row.storage[static_cast<size_t>(rs->rowidField_)] == SQLITE_INTEGER) {
            row.rowid = sqlite3_column_int64(s, rs->rowidField_);
            row.hasRowid = true;
        }
        rs->rows_.push_back(std::move(row));
    }
    return rs;
}

}  // namespace maroset::platform
