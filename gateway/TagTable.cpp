#include "gateway/TagTable.h"

#include <set>
#include <utility>

#include "core/nodeDB.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"
#include "lang/VbError.h"
#include "platform/Database.h"

namespace maroset::gateway {

namespace {

bool hasTagsTable(platform::Database& db) {
    auto rs = db.OpenRecordset(
        "select name from sqlite_master where type = 'table' and "
        "name like 'Tags'");
    return rs->RecordCount() > 0;
}

std::string text(const Variant& v) {
    return v.isNull() || v.isEmpty() ? std::string() : CStr(v);
}

}  // namespace

std::vector<TagTable::Row> TagTable::Rows(const std::filesystem::path& project) {
    auto db = platform::Database::Open(project);
    std::vector<Row> rows;
    if (!hasTagsTable(*db)) return rows;
    auto rs = db->OpenRecordset("select Node, Handle, Address, Name from Tags");
    if (rs->RecordCount() == 0) return rows;
    for (rs->MoveFirst(); !rs->eof(); rs->MoveNext()) {
        Row row;
        row.node = text(rs->Fields("Node"));
        const Variant handle = rs->Fields("Handle");
        // A handle that is no whole number in range is kept out of range, so Register reports it.
        try {
            row.handle = handle.isNull() ? 0 : CLng(handle);
        } catch (const VbError&) {
            row.handle = -1;
        }
        row.address = text(rs->Fields("Address"));
        row.name = text(rs->Fields("Name"));
        if (row.name.empty()) row.name = row.address;
        rows.push_back(std::move(row));
    }
    return rows;
}

void TagTable::Add(const std::filesystem::path& project, const Row& row) {
    auto db = platform::Database::Open(project);
    db->Execute(
        "CREATE TABLE IF NOT EXISTS Tags (Node TEXT, Handle INTEGER, Address TEXT, "
        "Name TEXT)");
    for (const Row& existing : Rows(project)) {
        if (UCase(existing.node) == UCase(row.node) && existing.handle == row.handle)
            throw VbError(err::DuplicateKey);
    }
    db->Execute("insert into Tags (Node, Handle, Address, Name) values (?, ?, ?, ?)",
                {Variant(row.node), Variant(row.handle), Variant(row.address),
                 row.name.empty() ? Variant::Null() : Variant(row.name)});
}

bool TagTable::Remove(const std::filesystem::path& project, const std::string& node,
                      int32_t handle) {
    const size_t before = Rows(project).size();
    if (before == 0) return false;
    auto db = platform::Database::Open(project);
    db->Execute("delete from Tags where upper(Node) = upper(?) and Handle = ?",
                {Variant(node), Variant(handle)});
    return Rows(project).size() < before;
}

std::vector<TagTable::Row> TagTable::Register(
    nodeDB& db, const std::vector<Row>& rows,
    const std::function<void(const std::string&)>& badRow) {
    std::vector<Row> registered;
    std::set<std::pair<std::string, int32_t>> taken;
    for (const Row& row : rows) {
        const std::string where =
            "tag " + row.node + " " + std::to_string(row.handle) + " (" + row.address + "): ";
        auto n = db.getNode(row.node);
        if (!n) {
            badRow(where + "no node named '" + row.node + "' in the project");
            continue;
        }
        if (row.handle < 1 || row.handle > MaxHandle) {
            badRow(where + "handle out of range (1 to " + std::to_string(MaxHandle) + ")");
            continue;
        }
        const auto key = std::make_pair(UCase(row.node), row.handle);
        if (taken.count(key)) {
            badRow(where + "handle " + std::to_string(row.handle) + " is already used on " +
                   row.node);
            continue;
        }
        try {
            n->AddTag(row.handle, row.address);
        } catch (const VbError& e) {
            badRow(where + "error " + std::to_string(e.number()) + ": " + e.description());
            continue;
        }
        taken.insert(key);
        registered.push_back(row);
    }
    return registered;
}

}  // namespace maroset::gateway
