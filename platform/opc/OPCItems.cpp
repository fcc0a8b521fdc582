#include "platform/opc/OPCItems.h"

#include "platform/opc/OpcConnection.h"
#include "platform/opc/OpcErrors.h"

namespace maroset::platform {

namespace {
constexpr const char* kSource = "OPCItems";
}

OPCItems::OPCItems() = default;
OPCItems::~OPCItems() = default;

void OPCItems::attach(std::shared_ptr<OpcConnection> connection) {
    connection_ = std::move(connection);
    if (!connection_) {
        // The group is gone from the server: its items with it.
        entries_.clear();
        byHandle_.clear();
        live_ = 0;
    }
}

void OPCItems::AddItems(int32_t NumItems, const VbArray<std::string>& ItemIDs,
                        const VbArray<int32_t>& ClientHandles, VbArray<int32_t>& ServerHandles,
                        VbArray<int32_t>& Errors) {
    if (!connection_) {
        throw opc::Failure(opc::E_FAIL, kSource, "The group has been removed from the server");
    }
    if (NumItems < 1) throw opc::Failure(opc::E_INVALIDARG, kSource);
    // Both input arrays are checked before anything is added.
    (void)ItemIDs(NumItems);
    (void)ClientHandles(NumItems);
    (void)ItemIDs(1);
    (void)ClientHandles(1);
    VbArray<int32_t> handles(1, NumItems);
    VbArray<int32_t> errors(1, NumItems);
    for (int32_t i = 1; i <= NumItems; ++i) {
        std::shared_ptr<OpcItemSource> source;
        const int32_t hr = connection_->backend->AddItem(ItemIDs(i), source);
        if (hr < 0 || !source) {
            errors(i) = hr < 0 ? hr : opc::E_FAIL;
            continue;
        }
        Entry e;
        e.serverHandle = nextHandle_++;
        e.clientHandle = ClientHandles(i);
        e.itemID = ItemIDs(i);
        e.source = std::move(source);
        byHandle_[e.serverHandle] = entries_.size();
        entries_.push_back(std::move(e));
        ++live_;
        entries_.back().source->Scan(scan_);
        handles(i) = entries_.back().serverHandle;
        errors(i) = hr;
    }
    ServerHandles = std::move(handles);
    Errors = std::move(errors);
}

void OPCItems::Remove(int32_t NumItems, const VbArray<int32_t>& ServerHandles,
                      VbArray<int32_t>& Errors) {
    if (!connection_) {
        throw opc::Failure(opc::E_FAIL, kSource, "The group has been removed from the server");
    }
    if (NumItems < 1) throw opc::Failure(opc::E_INVALIDARG, kSource);
    (void)ServerHandles(NumItems);
    (void)ServerHandles(1);
    VbArray<int32_t> errors(1, NumItems);
    for (int32_t i = 1; i <= NumItems; ++i) {
        const auto it = byHandle_.find(ServerHandles(i));
        if (it == byHandle_.end()) {
            errors(i) = opc::OPC_E_INVALIDHANDLE;
            continue;
        }
        Entry& e = entries_[it->second];
        e.source.reset();
        e.lastValue = Variant();
        byHandle_.erase(it);
        --live_;
    }
    Errors = std::move(errors);
    compact();
}

void OPCItems::scan(const OpcScan& scan) {
    scan_ = scan;
    for (Entry& e : entries_) {
        if (e.source) e.source->Scan(scan_);
    }
}

OPCItems::Entry* OPCItems::find(int32_t serverHandle) {
    const auto it = byHandle_.find(serverHandle);
    return it == byHandle_.end() ? nullptr : &entries_[it->second];
}

void OPCItems::compact() {
    // Removed entries are dropped once they are the majority, so that removing items one by
    // one stays cheap and the add order is kept.
    const size_t dead = entries_.size() - static_cast<size_t>(live_);
    if (dead * 2 <= entries_.size()) return;
    std::vector<Entry> kept;
    kept.reserve(static_cast<size_t>(live_));
    byHandle_.clear();
    for (Entry& e : entries_) {
        if (!e.source) continue;
        byHandle_[e.serverHandle] = kept.size();
        kept.push_back(std::move(e));
    }
    entries_ = std::move(kept);
}

}  // namespace maroset::platform
