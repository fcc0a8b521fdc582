#include "drivers/local/ClsDriverDiskTag.h"

#include <memory>

#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ValueReport.h"
#include "platform/Database.h"

namespace maroset {

namespace {

constexpr const char* kModule = "ClsDriverDiskTag";

using platform::Database;
using platform::Recordset;

platform::FileSystem& files() {
    return Runtime::current().files();
}

// An object that a skipped statement (trap on) left unset fails the statements that use it,
// as an unset object variable does.
template <class T>
T& use(const std::unique_ptr<T>& object) {
    if (!object) throw VbError(err::ObjectNotSet);
    return *object;
}

// The file at a drive C: path; a path that leaves the drive root is refused (75) before any
// file is touched.
std::unique_ptr<Database> openFile(const std::string& path) {
    return Database::Open(files().resolve(path));
}

}  // namespace

// The operations that do nothing have no statement to trap.
void ClsDriverDiskTag::shutdown() {}

void ClsDriverDiskTag::startup(std::string, std::string TopicName) {
    Procedure proc(kModule, "startup");
    proc.run([&] { tagNames_.ReDim(0, 1); });
    proc.run([&] { clientHandles_.ReDim(0, 1); });
    proc.run([&] { path_ = std::string(Folder) + TopicName + ".mdb"; });
    // One level only: the drive root always exists.
    proc.run([&] {
        if (!files().FolderExists(Folder)) files().CreateFolder(Folder);
    });
    // FileExists is false for a path outside the drive root; CreateDISKIODB then refuses it.
    // A blank file, left by a creation that an older version did not finish, counts as none.
    proc.run([&] {
        if (!files().FileExists(path_) || Database::Blank(files().resolve(path_)))
            CreateDISKIODB();
    });
}

void ClsDriverDiskTag::PostMessage(int32_t&) {}

void ClsDriverDiskTag::IsActive(bool) {}

void ClsDriverDiskTag::RemoveItem(int16_t) {}

std::string ClsDriverDiskTag::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverDiskTag::slotOf(int32_t handle) const {
    // Runs past the last slot into Subscript out of range for a handle never added.
    int32_t i = 1;
    while (clientHandles_(i) != handle) ++i;
    return i;
}

std::string ClsDriverDiskTag::tagName(Procedure& proc, int32_t handle) const {
    int32_t slot = 0;
    std::string name;
    proc.run([&] { slot = slotOf(handle); });
    proc.run([&] { name = tagNames_(slot); });
    return name;
}

std::unique_ptr<Recordset> ClsDriverDiskTag::queryRow(Procedure& proc,
                                                      const std::string& name) const {
    std::unique_ptr<Database> db;
    std::unique_ptr<Recordset> rs;
    proc.run([&] { db = openFile(path_); });
    // The name goes in as it stands: the engine's wildcards in it match other rows, and a quote
    // fails the query. Two blanks before "where", as always.
    proc.run([&] {
        rs = use(db).OpenRecordset("select * from TagValues  where TagName like '" + name + "'");
    });
    return rs;  // keeps the file open until the caller's operation ends
}

int32_t ClsDriverDiskTag::WriteItem(int32_t ClientHandle, const Variant& data) {
    Procedure proc(kModule, "WriteItem");
    const auto rs = queryRow(proc, tagName(proc, ClientHandle));
    // No row: No current record (3021) here, and nothing is written or reported.
    proc.run([&] { use(rs).MoveFirst(); });
    proc.run([&] { use(rs).Edit(); });
    // "Tagvalue" here and "TagValue" in the table: field names ignore case.
    proc.run([&] { use(rs).setField("Tagvalue", data); });
    // Committed and synced when Update returns, so the report below never runs ahead of the
    // disk.
    proc.run([&] { use(rs).Update(); });
    // The written value goes back, not the text stored.
    proc.run([&] { ReportValue(*this, ClientHandle, data); });
    return 0;
}

bool ClsDriverDiskTag::AddItem(const std::string& TagName, int16_t ClientHandle) {
    Procedure proc(kModule, "AddItem");
    int32_t n = 0;
    proc.run([&] {
        // The bound of a table that startup never sized does not exist.
        if (tagNames_.empty()) throw VbError(err::SubscriptOutOfRange);
        n = tagNames_.UBound();
    });
    proc.run([&] { tagNames_.ReDimPreserve(n + 1); });
    proc.run([&] { clientHandles_.ReDimPreserve(n + 1); });
    // Into the empty last slot; the new slot n + 1 is the empty one now.
    proc.run([&] { tagNames_(n) = TagName; });
    proc.run([&] { clientHandles_(n) = ClientHandle; });

    const auto rs = queryRow(proc, TagName);
    // A condition that fails under the trap counts as false: no row is added blindly.
    bool missing = false;
    proc.run([&] { missing = use(rs).RecordCount() == 0; });
    if (missing) {
        proc.run([&] { use(rs).AddNew(); });
        proc.run([&] { use(rs).setField("TagName", Variant(TagName)); });
        proc.run([&] { use(rs).setField("Tagvalue", Variant(int16_t{0})); });
        proc.run([&] { use(rs).Update(); });
    }
    return false;
}

bool ClsDriverDiskTag::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    return false;
}

int32_t ClsDriverDiskTag::ReadItem(int32_t ClientHandle) {
    Procedure proc(kModule, "ReadItem");
    const auto rs = queryRow(proc, tagName(proc, ClientHandle));
    bool found = false;
    proc.run([&] { found = use(rs).RecordCount() > 0; });
    if (found) {
        Variant value;
        proc.run([&] { use(rs).MoveFirst(); });
        proc.run([&] { value = use(rs).Fields("Tagvalue"); });
        proc.run([&] { ReportValue(*this, ClientHandle, value); });
    }
    return 0;
}

int32_t ClsDriverDiskTag::ReadAllItems() {
    return 0;
}

void ClsDriverDiskTag::CreateDISKIODB() {
    Procedure proc(kModule, "CreateDISKIODB");
    // The original file's locale (general sort order, code page 1252) has no counterpart:
    // text is kept as the bytes given, and like() folds case itself.
    // The table and its index are made with the file, so a kill leaves no file without them.
    // ID is the engine's auto-increment (its default was "GenUniqueID()"); the text fields
    // have the engine's default size, which here means no limit. IDIndex is the primary index
    // under its own name; ID is the table's key already.
    proc.run([&] {
        Database::Create(files().resolve(path_),
                         {"CREATE TABLE TagValues (ID INTEGER PRIMARY KEY AUTOINCREMENT, "
                          "TagName TEXT, TagValue TEXT)",
                          "CREATE UNIQUE INDEX IDIndex ON TagValues (ID)"});
    });
}

int32_t ClsDriverDiskTag::WriteArray(int32_t, VbArray<Variant>&) {
    return 0;
}

}  // namespace maroset
