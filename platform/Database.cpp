#include "platform/Database.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>
#include <system_error>

#include "lang/Conversions.h"
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

void Database::Execute(const std::string& sql, const std::vector<Variant>& parameters) {
    auto statement = connection_->Prepare(sql);
    sqlite3_stmt* s = statement.get();
    if (sqlite3_bind_parameter_count(s) != static_cast<int>(parameters.size()))
        throw VbError(dberr::TooFewParameters, "Too few parameters.");
    for (size_t i = 0; i < parameters.size(); ++i) {
        const Variant& v = parameters[i];
        const int index = static_cast<int>(i) + 1;
        switch (v.type()) {
            case VarType::Empty:
            case VarType::Null:
                sqlite3_bind_null(s, index);
                break;
            case VarType::Single:
            case VarType::Double:
                sqlite3_bind_double(s, index, CDbl(v));
                break;
            case VarType::String:
                sqlite3_bind_text(s, index, v.string().data(), static_cast<int>(v.string().size()),
                                  SQLITE_TRANSIENT);
                break;
            default:
                sqlite3_bind_int64(s, index, CLng(v));
                break;
        }
    }
    while (connection_->Step(s, sql)) {
    }
}

std::unique_ptr<Recordset> Database::OpenRecordset(const std::string& sql) {
    auto statement = connection_->Prepare(sql);
    sqlite3_stmt* s = statement.get();
    const int count = sqlite3_column_count(s);
    if (count == 0 || !sqlite3_stmt_readonly(s))
        throw VbError(dberr::InvalidOperation, "Invalid operation.");

    std::unique_ptr<Recordset> rs(new Recordset(connection_));
    rs->load(s, sql);
    return rs;
}

}  // namespace maroset::platform
