#include "platform/Database.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
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

// Whether fresh connections already write with full syncs, as SQLite is built by default;
// asked once, so connections need no statement of their own to set it.
bool SyncsFullByDefault() {
    static const bool full = [] {
        sqlite3* db = nullptr;
        sqlite3_open_v2(":memory:", &db, SQLITE_OPEN_READWRITE, nullptr);
        sqlite3_stmt* s = nullptr;
        sqlite3_prepare_v2(db, "PRAGMA synchronous", -1, &s, nullptr);
        const bool yes = sqlite3_step(s) == SQLITE_ROW && sqlite3_column_int(s, 0) == 2;
        sqlite3_finalize(s);
        sqlite3_close(db);
        return yes;
    }();
    return full;
}

std::shared_ptr<SqliteConnection> Connect(const fs::path& file) {
    sqlite3* db = nullptr;
    const int rc = sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READWRITE, nullptr);
    auto connection = std::make_shared<SqliteConnection>(db, file);
    if (rc != SQLITE_OK) connection->Fail(rc, "");
    // Each write is on the disk before the call that made it returns.
    if (!SyncsFullByDefault()) connection->Run("PRAGMA synchronous = FULL");
    // SQLite reads nothing until the first statement: read the schema now, so that a file that
    // is not a database fails here, as the original engine failed on opening it.
    const int schema = sqlite3_table_column_metadata(db, "main", "sqlite_master", nullptr, nullptr,
                                                     nullptr, nullptr, nullptr, nullptr);
    if (schema != SQLITE_OK) connection->Fail(schema, "");
    return connection;
}

void SyncFolder(const fs::path& folder) {
    const int fd =
        ::open(folder.empty() ? "." : folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd < 0) return;
    ::fsync(fd);
    ::close(fd);
}

VbError Exists(const fs::path& file) {
    return VbError(err::DatabaseExists, "Database '" + file.string() + "' already exists.");
}

VbError CannotCreate(const fs::path& file, int error) {
    if (error == EACCES || error == EPERM || error == EROFS)
        return VbError(dberr::CannotOpenFile,
                       "The database engine cannot open the file '" + file.string() +
                           "'. It is already opened exclusively by another user, or you need "
                           "permission to view its data.");
    return VbError(dberr::NotAValidPath, "'" + file.parent_path().string() +
                                             "' is not a valid path. Make sure that the path "
                                             "name is spelled correctly.");
}

// Gives the finished file at `building` its name. link() never replaces a file, so of two
// creators only one wins; a blank file in the way is replaced by rename(), which is atomic.
void Publish(const fs::path& building, const fs::path& file) {
    if (::link(building.c_str(), file.c_str()) != 0) {
        const int error = errno;
        if (error != EEXIST) throw CannotCreate(file, error);
        if (!Database::Blank(file)) throw Exists(file);
        if (::rename(building.c_str(), file.c_str()) != 0) throw CannotCreate(file, errno);
    }
    std::error_code ec;
    fs::remove(building, ec);
    SyncFolder(file.parent_path());
}

}  // namespace

std::unique_ptr<Database> Database::Open(const fs::path& file) {
    RefuseNul(file);
    std::error_code ec;
    if (!fs::is_regular_file(file, ec))
        throw VbError(err::CouldNotFindFile, "Could not find file '" + file.string() + "'.");
    return std::unique_ptr<Database>(new Database(Connect(file)));
}

std::unique_ptr<Database> Database::Create(const fs::path& file,
                                           std::initializer_list<std::string_view> schema) {
    RefuseNul(file);
    std::error_code ec;
    if (fs::exists(file, ec) && !Blank(file)) throw Exists(file);
    // A unique name, so two creators never build in one file; a kill leaves only this name.
    std::string building = file.native() + ".XXXXXX";
    const int fd = ::mkstemp(building.data());
    if (fd < 0) throw CannotCreate(file, errno);
    ::fchmod(fd, 0644);
    ::close(fd);
    try {
        {
            auto connection = Connect(building);
            // Write the header first, so even a schema-less file is a database.
            connection->Run("PRAGMA application_id = 1296126803");  // "MRSS"
            for (const auto sql : schema) connection->Run(sql);
        }  // closed: every page is on the disk before the file gets its name
        Publish(building, file);
    } catch (...) {
        fs::remove(building, ec);
        throw;
    }
    return std::unique_ptr<Database>(new Database(Connect(file)));
}

bool Database::Blank(const fs::path& file) {
    std::error_code ec;
    if (!fs::is_regular_file(file, ec)) return false;
    if (fs::file_size(file, ec) == 0 && !ec) return true;
    sqlite3* db = nullptr;
    const int rc = sqlite3_open_v2(file.c_str(), &db, SQLITE_OPEN_READONLY, nullptr);
    const SqliteConnection connection(db, file);
    if (rc != SQLITE_OK) return false;
    try {
        auto statement = connection.Prepare("SELECT count(*) FROM sqlite_master");
        return connection.Step(statement.get(), "") && sqlite3_column_int(statement.get(), 0) == 0;
    } catch (const VbError&) {
        return false;  // not a database at all: not ours to replace
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
