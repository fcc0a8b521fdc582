#include "platform/opc/OPCGroup.h"

#include <utility>
#include <vector>

#include "platform/opc/OpcConnection.h"
#include "platform/opc/OpcErrors.h"
#include "platform/opc/OpcItemSource.h"

namespace maroset::platform {

namespace {
constexpr const char* kSource = "OPCGroup";
}

struct OPCGroup::ReadRequest {
    int32_t transactionID;
    std::vector<std::pair<int32_t, int32_t>> items;  // server handle, client handle
};

struct OPCGroup::WriteRequest {
    int32_t transactionID;
    struct Item {
        int32_t serverHandle;
        int32_t clientHandle;
        Variant value;
    };
    std::vector<Item> items;
};

OPCGroup::OPCGroup(Token, std::shared_ptr<OpcConnection> connection, std::string name, bool active,
                   int32_t updateRate)
    : connection_(std::move(connection)),
      name_(std::move(name)),
      active_(active),
      updateRate_(updateRate < FastestUpdateRate ? FastestUpdateRate : updateRate),
      timer_(connection_->loop) {
    items_.attach(connection_);
    tick_ = timer_.Tick.subscribe([this] { update(); });
    rearm();
}

OPCGroup::~OPCGroup() = default;

void OPCGroup::detach() {
    connection_.reset();
    items_.attach(nullptr);
    rearm();
}

void OPCGroup::requireLive(const char* what) const {
    if (!connection_) {
        throw opc::Failure(
            opc::E_FAIL, kSource,
            std::string("The group has been removed from the server (") + what + ")");
    }
}

void OPCGroup::rearm() {
    if (connection_) items_.scan(OpcScan{active_, updateRate_, name_});
    const bool on = connection_ && active_ && subscribed_;
    if (on) timer_.Interval(updateRate_);
    timer_.Enabled(on);
}

void OPCGroup::IsActive(bool value) {
    requireLive("IsActive");
    if (value && !active_) {
        // Activation starts the reports afresh: the first one holds every item.
        items_.forEach([](OPCItems::Entry& e) { e.reported = false; });
    }
    const bool changed = value != active_;
    active_ = value;
    if (changed) rearm();
}

void OPCGroup::IsSubscribed(bool value) {
    requireLive("IsSubscribed");
    const bool changed = value != subscribed_;
    subscribed_ = value;
    if (changed) rearm();
}

void OPCGroup::UpdateRate(int32_t value) {
    requireLive("UpdateRate");
    if (value < 0) throw opc::Failure(opc::E_INVALIDARG, kSource);
    updateRate_ = value < FastestUpdateRate ? FastestUpdateRate : value;
    rearm();
}

void OPCGroup::update() {
    if (!connection_ || !active_ || !subscribed_) return;
    // A handler may release the group: it lives until this tick is over.
    const auto self = shared_from_this();
    changed_.clear();
    changedAt_.clear();
    items_.forEach([&](OPCItems::Entry& e) {
        OpcItemState state = e.source->Read();
        if (e.reported && state.quality == e.lastQuality && state.value == e.lastValue) return;
        e.reported = true;
        e.lastQuality = state.quality;
        e.lastValue = std::move(state.value);
        changed_.push_back(&e);
        changedAt_.push_back(state.timeStamp);
    });
    if (changed_.empty()) return;
    const auto count = static_cast<int32_t>(changed_.size());
    clientHandles_.ReDim(1, count);
    itemValues_.ReDim(1, count);
    qualities_.ReDim(1, count);
    timeStamps_.ReDim(1, count);
    for (int32_t i = 1; i <= count; ++i) {
        const OPCItems::Entry& e = *changed_[static_cast<size_t>(i - 1)];
        clientHandles_(i) = e.clientHandle;
        itemValues_(i) = e.lastValue;
        qualities_(i) = e.lastQuality;
        timeStamps_(i) = changedAt_[static_cast<size_t>(i - 1)];
    }
    changed_.clear();  // the handlers may add or remove items
    DataChange.raise(0, count, clientHandles_, itemValues_, qualities_, timeStamps_);
}

void OPCGroup::AsyncRead(int32_t NumItems, const VbArray<int32_t>& ServerHandles,
                         VbArray<int32_t>& Errors, int32_t TransactionID, int32_t& CancelID) {
    requireLive("AsyncRead");
    if (NumItems < 1) throw opc::Failure(opc::E_INVALIDARG, kSource);
    (void)ServerHandles(1);
    (void)ServerHandles(NumItems);
    VbArray<int32_t> errors(1, NumItems);
    auto request = std::make_shared<ReadRequest>(ReadRequest{TransactionID, {}});
    for (int32_t i = 1; i <= NumItems; ++i) {
        const OPCItems::Entry* e = items_.find(ServerHandles(i));
        if (!e) {
            errors(i) = opc::OPC_E_INVALIDHANDLE;
            continue;
        }
        request->items.emplace_back(e->serverHandle, e->clientHandle);
    }
    Errors = std::move(errors);
    CancelID = nextCancelID_++;
    if (request->items.empty()) return;
    auto complete = [weak = weak_from_this(), request] {
        if (auto self = weak.lock()) self->completeRead(*request);
    };
    // A server that reads from its device answers once it has; the others at the next turn.
    std::vector<std::shared_ptr<OpcItemSource>> sources;
    for (const auto& [serverHandle, clientHandle] : request->items)
        sources.push_back(items_.find(serverHandle)->source);
    if (!connection_->backend->Refresh(sources, complete)) connection_->loop.post(complete);
}

void OPCGroup::completeRead(const ReadRequest& request) {
    if (!connection_) return;  // removed meanwhile: nobody is listening
    const auto count = static_cast<int32_t>(request.items.size());
    VbArray<int32_t> ClientHandles(1, count);
    VbArray<Variant> ItemValues(1, count);
    VbArray<int32_t> Qualities(1, count);
    VbArray<DateTime> TimeStamps(1, count);
    VbArray<int32_t> Errors(1, count);
    for (int32_t i = 1; i <= count; ++i) {
        const auto [serverHandle, clientHandle] = request.items[static_cast<size_t>(i - 1)];
        ClientHandles(i) = clientHandle;
        if (OPCItems::Entry* e = items_.find(serverHandle)) {
            OpcItemState state = e->source->Read();
            ItemValues(i) = std::move(state.value);
            Qualities(i) = state.quality;
            TimeStamps(i) = state.timeStamp;
        } else {
            // Removed between the request and its answer.
            Qualities(i) = opc::OPC_QUALITY_BAD;
            TimeStamps(i) = connection_->clock.now();
            Errors(i) = opc::OPC_E_INVALIDHANDLE;
        }
    }
    AsyncReadComplete.raise(request.transactionID, count, ClientHandles, ItemValues, Qualities,
                            TimeStamps, Errors);
}

void OPCGroup::AsyncWrite(int32_t NumItems, const VbArray<int32_t>& ServerHandles,
                          const VbArray<Variant>& Values, VbArray<int32_t>& Errors,
                          int32_t TransactionID, int32_t& CancelID) {
    requireLive("AsyncWrite");
    if (NumItems < 1) throw opc::Failure(opc::E_INVALIDARG, kSource);
    (void)ServerHandles(1);
    (void)ServerHandles(NumItems);
    (void)Values(1);
    (void)Values(NumItems);
    VbArray<int32_t> errors(1, NumItems);
    auto request = std::make_shared<WriteRequest>(WriteRequest{TransactionID, {}});
    for (int32_t i = 1; i <= NumItems; ++i) {
        const OPCItems::Entry* e = items_.find(ServerHandles(i));
        if (!e) {
            errors(i) = opc::OPC_E_INVALIDHANDLE;
        } else if (!e->source->Writable()) {
            errors(i) = opc::OPC_E_BADRIGHTS;
        } else if (Values(i).isObject()) {
            errors(i) = opc::OPC_E_BADTYPE;
        } else {
            request->items.push_back({e->serverHandle, e->clientHandle, Values(i)});
        }
    }
    Errors = std::move(errors);
    CancelID = nextCancelID_++;
    if (request->items.empty()) return;
    connection_->loop.post([weak = weak_from_this(), request] {
        if (auto self = weak.lock()) self->completeWrite(*request);
    });
}

void OPCGroup::completeWrite(WriteRequest& request) {
    if (!connection_) return;
    const auto count = static_cast<int32_t>(request.items.size());
    VbArray<int32_t> ClientHandles(1, count);
    VbArray<int32_t> Errors(1, count);
    for (int32_t i = 1; i <= count; ++i) {
        auto& item = request.items[static_cast<size_t>(i - 1)];
        ClientHandles(i) = item.clientHandle;
        OPCItems::Entry* e = items_.find(item.serverHandle);
        Errors(i) = e ? e->source->Write(item.value) : opc::OPC_E_INVALIDHANDLE;
    }
    AsyncWriteComplete.raise(request.transactionID, count, ClientHandles, Errors);
}

}  // namespace maroset::platform
