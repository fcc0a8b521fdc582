#pragma once

#include <gtest/gtest.h>

#include "platform/Database.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

namespace maroset::platform {

// A project database laid out with SQLite itself, so the seam is checked against the engine:
// TagValues keyed by ID, and Nodes without an integer key and with two identical rows.
class ProjectDatabase : public ::testing::Test {
  protected:
    ProjectDatabase() {
        test::RunSqlScript(
            file(),
            "CREATE TABLE TagValues (ID INTEGER PRIMARY KEY AUTOINCREMENT, TagName TEXT, "
            "TagValue TEXT); CREATE UNIQUE INDEX IDIndex ON TagValues (ID); INSERT INTO TagValues "
            "VALUES (1, 'Level', '0'), (2, 'Level2', '4'), (3, 'Flow', '1'), (4, 'O''Brien', '8');"
            "CREATE TABLE Nodes (Name TEXT, Driver TEXT, UpdateRate INTEGER, Port NUMERIC);"
            "INSERT INTO Nodes VALUES ('Line1', 'DiskTag', 1000, 502), "
            "('Line1', 'DiskTag', 1000, 502), ('Line2', 'MemTag', 500, NULL);");
    }
    std::filesystem::path file() const { return dir_.path() / "Line1.mdb"; }
    // The first field of the first row, read through a connection of its own.
    Variant fresh(const std::string& query) const {
        auto rs = Database::Open(file())->OpenRecordset(query);
        return rs->Fields(rs->FieldNames().front());
    }

    test::TempDir dir_;
};

}  // namespace maroset::platform
