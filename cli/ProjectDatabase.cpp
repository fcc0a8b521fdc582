#include "cli/ProjectDatabase.h"

#include <strings.h>

#include "lang/Conversions.h"
#include "lang/VbError.h"
#include "platform/Database.h"
#include "platform/Recordset.h"

namespace maroset::cli {

namespace {

constexpr const char* kQuery = "select * from Nodes ";

}  // namespace

void ProjectDatabase::Create(const std::filesystem::path& file) {
    platform::Database::Create(
        file, {"CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
               "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, "
               "IPAddress TEXT, Port INTEGER)"});
}

void ProjectDatabase::AddNode(const std::filesystem::path& file, const std::vector<Field>& fields) {
    auto db = platform::Database::Open(file);
    auto rs = db->OpenRecordset(kQuery);
    std::string name;
    for (const auto& [column, value] : fields) {
        if (strcasecmp(column.c_str(), "Name") == 0) name = CStr(value);
    }
    if (rs->RecordCount() > 0) {
        for (rs->MoveFirst(); !rs->eof(); rs->MoveNext()) {
            const Variant existing = rs->Fields("Name");
            if (!existing.isNull() && strcasecmp(CStr(existing).c_str(), name.c_str()) == 0)
                throw VbError(err::DuplicateKey);
        }
    }
    rs->AddNew();
    for (const auto& [column, value] : fields) rs->setField(column, value);
    rs->Update();
}

std::vector<std::vector<Variant>> ProjectDatabase::Rows(const std::filesystem::path& file) {
    auto db = platform::Database::Open(file);
    auto rs = db->OpenRecordset(kQuery);
    std::vector<std::vector<Variant>> rows;
    if (rs->RecordCount() == 0) return rows;
    for (rs->MoveFirst(); !rs->eof(); rs->MoveNext()) {
        std::vector<Variant> row;
        for (const char* column : Columns) row.push_back(rs->Fields(column));
        rows.push_back(std::move(row));
    }
    return rows;
}

}  // namespace maroset::cli
