#include "core/nodeDB.h"

#include <algorithm>
#include <cctype>
#include <utility>

#include "core/Procedure.h"
#include "core/Runtime.h"
#include "lang/Conversions.h"
#include "platform/Database.h"

namespace maroset {

namespace {

constexpr const char* kModule = "NodeDB";

bool sameKey(const std::string& a, const std::string& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](unsigned char x, unsigned char y) {
        return std::tolower(x) == std::tolower(y);
    });
}

// A path with a drive or backslashes is a path on drive C:; anything else is native.
std::filesystem::path projectFile(const std::string& name) {
    const bool drivePath =
        (name.size() >= 2 && name[1] == ':') || name.find('\\') != std::string::npos;
    return drivePath ? Runtime::current().files().resolve(name) : std::filesystem::path(name);
}

VbArray<Variant> oneBased(std::initializer_list<const char*> texts) {
    VbArray<Variant> array(1, static_cast<int32_t>(texts.size()));
    int32_t i = 1;
    for (const char* text : texts) array(i++) = Variant(text);
    return array;
}

}  // namespace

// The ordered, keyed collection of nodes. Keys compare without regard to letter case; adding
// a key that is there fails with error 457, looking up or removing one that is not with 5.
struct nodeDB::Collection {
    std::vector<std::pair<std::string, std::shared_ptr<node>>> items;

    auto find(const std::string& key) {
        return std::find_if(items.begin(), items.end(),
                            [&](const auto& item) { return sameKey(item.first, key); });
    }
    void Add(std::shared_ptr<node> item, const std::string& key) {
        if (find(key) != items.end()) throw VbError(err::DuplicateKey);
        items.emplace_back(key, std::move(item));
    }
    std::shared_ptr<node> Item(const std::string& key) {
        const auto it = find(key);
        if (it == items.end()) throw VbError(err::InvalidProcedureCall);
        return it->second;
    }
    void Remove(const std::string& key) {
        const auto it = find(key);
        if (it == items.end()) throw VbError(err::InvalidProcedureCall);
        const auto removed = std::move(it->second);  // released after the erase
        items.erase(it);
    }
};

nodeDB::nodeDB() = default;

nodeDB::~nodeDB() = default;

nodeDB::Collection& nodeDB::collection() {
    if (!nodes_) nodes_ = std::make_unique<Collection>();
    return *nodes_;
}

std::vector<std::shared_ptr<node>> nodeDB::nodes() const {
    std::vector<std::shared_ptr<node>> result;
    if (nodes_) {
        for (const auto& item : nodes_->items) result.push_back(item.second);
    }
    return result;
}

Variant nodeDB::GetDrivers() {
    Procedure proc(kModule, "GetDrivers");
    Variant result;
    proc.run([&] {
        result =
            oneBased({"MEMTAG", "OPC", "NUVABDF1", "DiskTag", "WagoIO", "NUVIntech", "NUVTCPIP"});
    });
    return result;
}

Variant nodeDB::GetDriverType() {
    Procedure proc(kModule, "GetDriverType");
    Variant result;
    // The sixth entry repeats 3 and the seventh 2: intended.
    proc.run([&] { result = oneBased({"1", "2", "3", "4", "5", "3", "2"}); });
    return result;
}

std::shared_ptr<node> nodeDB::getNode(const std::string& NodeName) {
    Procedure proc(kModule, "getNode", Procedure::Trap::ResumeNext);
    std::shared_ptr<node> result;
    proc.run([&] { result = collection().Item(NodeName); });
    return result;
}

int32_t nodeDB::count() {
    Procedure proc(kModule, "count");
    int32_t result = 0;
    proc.run([&] { result = static_cast<int32_t>(collection().items.size()); });
    return result;
}

void nodeDB::AddNode(const std::string& NodeName, const std::string& DriverName,
                     const std::string& OPCTopic, int32_t ScanRate, int32_t TagPrefex) {
    Procedure proc(kModule, "AddNode");
    std::shared_ptr<node> n;
    proc.run([&] { n = std::make_shared<node>(); });
    auto set = [&](auto&& assign) {
        proc.run([&] {
            if (!n) throw VbError(err::ObjectNotSet);
            assign(*n);
        });
    };
    // This order differs from AddAllNodes, and TagPrefex arrives as a number: both intended.
    set([&](node& x) { x.Name = NodeName; });
    set([&](node& x) { x.DriverName = DriverName; });
    set([&](node& x) { x.OPCTopic = OPCTopic; });
    set([&](node& x) { x.ScanRate = ScanRate; });
    set([&](node& x) { x.TagPrefex = TagPrefex; });
    set([&](node& x) { collection().Add(n, x.Name); });
    set([&](node& x) { x.Init(); });
}

void nodeDB::AddAllNodes(const std::string& ProjectDBName) {
    Procedure proc(kModule, "AddAllNodes");
    std::unique_ptr<platform::Database> db;
    std::unique_ptr<platform::Recordset> rs;
    proc.run([&] { db = platform::Database::Open(projectFile(ProjectDBName)); });
    proc.run([&] {
        if (!db) throw VbError(err::ObjectNotSet);
        rs = db->OpenRecordset("select * from Nodes ");  // the trailing blank is kept
    });
    auto recordset = [&]() -> platform::Recordset& {
        if (!rs) throw VbError(err::ObjectNotSet);
        return *rs;
    };

    // A condition that fails under the trap counts as false, so a missing recordset ends the
    // load instead of looping.
    bool any = false;
    proc.run([&] { any = recordset().RecordCount() != 0; });
    if (!any) return;
    proc.run([&] { recordset().MoveFirst(); });
    for (;;) {
        bool atEnd = true;
        proc.run([&] { atEnd = recordset().eof(); });
        if (atEnd) break;

        // The node being built is held only here: a node that did not make it into the
        // collection is released, and its driver shut down, once its Init returns.
        std::shared_ptr<node> n;
        proc.run([&] { n = std::make_shared<node>(); });
        auto set = [&](auto&& assign) {
            proc.run([&] {
                if (!n) throw VbError(err::ObjectNotSet);
                assign(*n, recordset());
            });
        };
        using R = platform::Recordset;
        set([](node& x, R& r) { x.Name = CStr(r.Fields("Name")); });
        set([](node& x, R& r) { x.DriverName = r.Fields("Driver"); });
        set([](node& x, R& r) { x.ServerName = r.Fields("OPCServer"); });
        set([](node& x, R& r) { x.OPCTopic = r.Fields("OPCTopic"); });
        set([](node& x, R& r) { x.ScanRate = r.Fields("UpdateRate"); });
        set([](node& x, R& r) { x.SerialPort = r.Fields("CommPort"); });
        set([](node& x, R& r) { x.BaudRate = r.Fields("BaudRate"); });
        set([](node& x, R& r) { x.TagPrefex = r.Fields("TagPrefex"); });
        set([](node& x, R& r) { x.IPAddress = r.Fields("IPAddress"); });
        set([](node& x, R& r) { x.Port = r.Fields("Port"); });
        set([&](node& x, R&) { collection().Add(n, x.Name); });
        set([](node& x, R&) { x.Init(); });
        proc.run([&] { recordset().MoveNext(); });
    }
}

void nodeDB::RemoveNode(const std::string& NodeName) {
    Procedure proc(kModule, "RemoveNode");
    proc.run([&] { collection().Remove(NodeName); });
}

void nodeDB::RemoveAllNodes() {
    Procedure proc(kModule, "RemoveAllNodes");
    for (const auto& n : nodes()) proc.run([&] { n->IsActive(false); });
    proc.run([&] {
        // Moved out first: drivers shutting down may call back into this nodeDB.
        auto dropped = std::move(nodes_);
        dropped.reset();
    });
}

void nodeDB::NewValue(VbArray<int32_t>& TagIDs, int16_t NumItems, VbArray<Variant>& Values) {
    Procedure proc(kModule, "NewValue");
    proc.run([&] { ValueChange.raise(TagIDs, NumItems, Values); });
}

void nodeDB::StartScanning() {
    Procedure proc(kModule, "StartScanning");
    for (const auto& n : nodes()) proc.run([&] { n->IsActive(true); });
}

void nodeDB::StopScanning() {
    Procedure proc(kModule, "StopScanning");
    for (const auto& n : nodes()) proc.run([&] { n->IsActive(false); });
}

void nodeDB::NUVError(const std::string& Driver, const std::string& FromSub,
                      const std::string& Message) {
    Procedure proc(kModule, "NUVError");
    proc.run([&] { DriverError.raise(Driver, FromSub, Message); });
}

}  // namespace maroset
