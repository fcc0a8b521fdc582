#include "support/SqlScript.h"

#include <sqlite3.h>

#include <stdexcept>

namespace maroset::test {

void RunSqlScript(const std::filesystem::path& file, const std::string& script) {
    sqlite3* db = nullptr;
    if (sqlite3_open(file.c_str(), &db) != SQLITE_OK) {
        sqlite3_close(db);
        throw std::runtime_error("cannot open " + file.string());
    }
    char* message = nullptr;
    const int rc = sqlite3_exec(db, script.c_str(), nullptr, nullptr, &message);
    const std::string error = message ? message : "";
    sqlite3_free(message);
    sqlite3_close(db);
    if (rc != SQLITE_OK) throw std::runtime_error("sql failed: " + error);
}

}  // namespace maroset::test
