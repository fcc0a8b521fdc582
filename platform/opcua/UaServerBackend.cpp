#include "platform/opcua/UaServerBackend.h"

#include <algorithm>

#include "platform/opc/OpcErrors.h"
#include "platform/opc/OpcItemSource.h"
#include "platform/opcua/UaServices.h"

namespace maroset::platform::opcua {

namespace {

constexpr uint32_t MonitoringDisabled = 0;
constexpr uint32_t MonitoringReporting = 2;
constexpr uint8_t AccessCurrentWrite = 0x02;
constexpr std::chrono::milliseconds CallWait{2500};  // the client gives up at 2 s

int32_t qualityOf(uint32_t status) {
    switch (status >> 30) {
        case 0:
            return opc::OPC_QUALITY_GOOD;
        case 1:
            return opc::OPC_QUALITY_UNCERTAIN;
        default:
            break;
    }
    switch (status & 0xFFFF0000u) {
        case status::BadNotConnected:
        case status::BadServerNotConnected:
            return opc::OPC_QUALITY_NOT_CONNECTED;
        case status::BadCommunicationError:
        case status::BadNoCommunication:
        case status::BadTimeout:
            return opc::OPC_QUALITY_COMM_FAILURE;
        case status::BadOutOfService:
            return opc::OPC_QUALITY_OUT_OF_SERVICE;
        case status::BadConfigurationError:
        case status::BadNodeIdUnknown:
        case status::BadNodeIdInvalid:
        case status::BadTypeMismatch:
            return opc::OPC_QUALITY_CONFIG_ERROR;
        default:
            return 0;
    }
}

int32_t resultOf(uint32_t status) {
    if (!IsBad(status)) return opc::S_OK;
    switch (status & 0xFFFF0000u) {
        case status::BadNodeIdUnknown:
            return opc::OPC_E_UNKNOWNITEMID;
        case status::BadNodeIdInvalid:
            return opc::OPC_E_INVALIDITEMID;
        case status::BadNotWritable:
        case status::BadUserAccessDenied:
            return opc::OPC_E_BADRIGHTS;
        case status::BadTypeMismatch:
            return opc::OPC_E_BADTYPE;
        case status::BadOutOfRange:
            return opc::OPC_E_RANGE;
        default:
            return opc::E_FAIL;
    }
}

}  // namespace

// One item of one group, as the server's cache holds it.
class UaItem final : public OpcItemSource {
  public:
    UaItem(std::shared_ptr<UaServerBackend> backend, std::string itemID, NodeId node,
           uint32_t handle, int32_t quality)
        : backend_(std::move(backend)),
          itemID_(std::move(itemID)),
          node_(std::move(node)),
          handle_(handle) {
        state_.quality = quality;
        state_.timeStamp = backend_->clock_.now();
    }
    ~UaItem() override { backend_->detach(*this); }

    OpcItemState Read() override { return state_; }
    bool Writable() const override { return !resolved_ || (accessLevel_ & AccessCurrentWrite); }
    int32_t Write(const Variant& value) override;
    void Scan(const OpcScan& scan) override;

    // What the backend keeps of the item.
    std::shared_ptr<UaServerBackend> backend_;
    std::string itemID_;
    NodeId node_;  // as given: an "nsu=" namespace is looked up on each session
    NodeId resolved_node_;
    uint32_t handle_;
    bool resolved_ = false;
    bool failed_ = false;  // refused by the server: tried again on the next session only
    BuiltIn dataType_ = BuiltIn::Null;
    bool array_ = false;
    uint8_t accessLevel_ = 0;
    OpcScan scan_;
    bool scanned_ = false;
    uint32_t subscription_ = 0;
    uint32_t monitored_ = 0;
    int32_t monitoredRate_ = 0;
    bool monitoredActive_ = false;
    OpcItemState state_;
};

int32_t UaItem::Write(const Variant& value) {
    UaServerBackend& b = *backend_;
    if (!resolved_ || b.client_->state() != UaClient::State::Active) {
        b.trace("write to " + itemID_ + " refused: no session", status::BadNotConnected);
        return opc::E_FAIL;
    }
    Variant converted;
    bool range = false;
    if (value.isArray() != array_ || !ConvertForType(value, dataType_, converted, range)) {
        b.trace("write to " + itemID_ + " refused: the value does not convert",
                range ? status::BadOutOfRange : status::BadTypeMismatch);
        return range ? opc::OPC_E_RANGE : opc::OPC_E_BADTYPE;
    }
    bool done = false;
    uint32_t result = status::BadTimeout;
    const NodeId node = resolved_node_;
    const BuiltIn type = dataType_;
    b.client_->call(
        msg::WriteRequest, msg::WriteResponse,
        [&](std::vector<Value>& v) {
            AddLength(v, 1);
            AddValue(v).node = node;
            AddNumber(v, attr::Value);
            AddValue(v).null = true;
            Value& d = AddValue(v);
            d.data.value = converted;
            d.data.type = type;
        },
        [&done, &result, alive = std::weak_ptr<bool>(b.alive_), &b](uint32_t s,
                                                                    std::vector<Value>& v) {
            const size_t i = AfterHeader(v);
            result = IsBad(s) || v.size() < i + 2 ? (s ? s : status::BadCommunicationError)
                                                  : static_cast<uint32_t>(v[i + 1].number);
            done = true;
            if (!alive.expired()) b.wake();
        });
    const auto self = backend_;  // the item may go while the loop runs
    if (!b.waitFor([&done] { return done; }, CallWait)) {
        b.trace("write to " + itemID_ + ": no answer", status::BadTimeout, IncidentKind::TimedOut);
        return opc::E_FAIL;
    }
    if (IsBad(result)) b.trace("write to " + itemID_ + " refused", result);
    return resultOf(result);
}

void UaItem::Scan(const OpcScan& scan) {
    const bool changed =
        !scanned_ || scan.active != scan_.active || scan.updateRate != scan_.updateRate;
    scan_ = scan;
    scanned_ = true;
    UaServerBackend& b = *backend_;
    if (!scan.group.empty()) b.nodes_.insert(scan.group);
    if (changed) b.scanChanged();
}

UaServerBackend::UaServerBackend(EventLoop& loop, const Clock& clock, TcpNetwork& network,
                                 const LinkIncidents& incidents, std::string endpointUrl,
                                 UaClient::Options options)
    : loop_(loop), clock_(clock), incidents_(incidents), url_(std::move(endpointUrl)) {
    options.endpointUrl = url_;
    const std::weak_ptr<bool> alive = alive_;
    UaClient::Handlers h;
    h.stateChanged = [this, alive](UaClient::State s) {
        if (!alive.expired()) onState(s);
    };
    // The client tells only what ends a connection: a lost session, or one never made.
    h.incident = [this, alive](const std::string& text, uint32_t status) {
        if (!alive.expired()) {
            trace(text, status, everActive_ ? IncidentKind::Closed : IncidentKind::OpenFailed);
        }
    };
    h.dataChange = [this](uint32_t sub, uint32_t handle, DataValue& v) {
        dataChange(sub, handle, v);
    };
    h.subscriptionLost = [this, alive](uint32_t, uint32_t status) {
        if (alive.expired() || subscriptions_.empty()) return;
        trace("the server dropped the subscriptions; making them again", status);
        for (auto& [handle, item] : items_) item->monitored_ = 0;
        subscriptions_.clear();
        scanChanged();
    };
    client_ = std::make_unique<UaClient>(loop, network, std::move(options), std::move(h));
}

UaServerBackend::~UaServerBackend() {
    *alive_ = false;
}

void UaServerBackend::trace(const std::string& text, uint32_t status, IncidentKind kind) {
    if (!incidents_.wanted()) return;
    if (kind == IncidentKind::Note && IsBad(status)) kind = IncidentKind::Refused;
    const auto said = [&] { return text + (status ? " (" + StatusName(status) + ")" : ""); };
    // Before any group has an item the node is not known yet: the endpoint stands for it.
    if (nodes_.empty()) {
        incidents_.report(url_, kind, url_, said);
        return;
    }
    // A node's line names the server too: a person reads which one failed.
    const auto words = [&] { return url_ + ": " + said(); };
    for (const auto& node : nodes_) incidents_.report(node, kind, url_, words);
}

void UaServerBackend::wake() {
    if (waiting_ > 0) loop_.stop();
}

bool UaServerBackend::waitFor(const std::function<bool()>& done, std::chrono::milliseconds limit) {
    const auto deadline = loop_.now() + limit;
    ++waiting_;
    while (!done() && loop_.now() < deadline) loop_.runFor(deadline - loop_.now());
    --waiting_;
    return done();
}

void UaServerBackend::ClientConnected() {
    ++clients_;
    if (client_->state() != UaClient::State::Idle) return;
    client_->start();
    // Connect answers at once in Data Access: wait for the server, briefly; a server that
    // is not there yet is tried again in the background.
    waitFor(
        [this] {
            const auto s = client_->state();
            return s == UaClient::State::Active || s == UaClient::State::Backoff ||
                   s == UaClient::State::Idle;
        },
        std::chrono::milliseconds(5000));
}

void UaServerBackend::ClientDisconnected() {
    if (--clients_ > 0) return;
    client_->stop();
    subscriptions_.clear();
    doomed_.clear();
    nodes_.clear();
}

std::string UaServerBackend::VendorInfo() const {
    return "Maroset OPC UA client, " + url_;
}

int32_t UaServerBackend::AddItem(const std::string& itemID, std::shared_ptr<OpcItemSource>& item) {
    NodeId node;
    if (!ParseNodeId(itemID, node)) {
        trace("item " + itemID + " refused: not a node id", status::BadNodeIdInvalid);
        return opc::OPC_E_INVALIDITEMID;
    }
    const uint32_t handle = nextHandle_++;
    const bool active = client_->state() == UaClient::State::Active;
    auto ua = std::make_shared<UaItem>(shared_from_this(), itemID, std::move(node), handle,
                                       everActive_ ? opc::OPC_QUALITY_COMM_FAILURE : opc::OPC_QUALITY_NOT_CONNECTED);
    items_[handle] = ua.get();
    if (active) {
        // Checked now: the caller learns at once whether the server knows the node.
        resolveAll();
        waitFor([&ua] { return ua->resolved_ || ua->failed_; }, CallWait);
        if (ua->failed_) {
            const int32_t result =
                ua->state_.quality == opc::OPC_QUALITY_CONFIG_ERROR && ua->dataType_ == BuiltIn::Null
                    ? opc::OPC_E_UNKNOWNITEMID
                    : opc::E_FAIL;
            return result;
        }
    }
    item = std::move(ua);
    return opc::S_OK;
}

bool UaServerBackend::Refresh(const std::vector<std::shared_ptr<OpcItemSource>>& items,
                              std::function<void()> done) {
    if (client_->state() != UaClient::State::Active) return false;
    std::vector<uint32_t> handles;
    std::vector<NodeId> nodes;
    for (const auto& source : items) {
        const auto* item = dynamic_cast<const UaItem*>(source.get());
        if (!item || !item->resolved_) continue;
        handles.push_back(item->handle_);
        nodes.push_back(item->resolved_node_);
    }
    if (nodes.empty()) return false;
    const std::weak_ptr<bool> alive = alive_;
    client_->call(
        msg::ReadRequest, msg::ReadResponse,
        [&nodes](std::vector<Value>& v) {
            AddValue(v).real = 0;  // the device's value, not a cached one
            AddNumber(v, 0);
            AddLength(v, static_cast<uint32_t>(nodes.size()));
            for (const NodeId& node : nodes) {
                AddValue(v).node = node;
                AddNumber(v, attr::Value);
                AddNull(v);
                AddNull(v);
            }
        },
        [this, alive, handles, done = std::move(done)](uint32_t s, std::vector<Value>& v) {
            if (!alive.expired()) {
                const size_t i = AfterHeader(v);
                const bool ok = !IsBad(s) && v.size() > i && v[i].count == handles.size();
                const DateTime now = clock_.now();
                for (size_t k = 0; ok && k < handles.size(); ++k) {
                    const auto it = items_.find(handles[k]);
                    if (it == items_.end()) continue;
                    DataValue& value = v[i + 1 + k].data;
                    OpcItemState& state = it->second->state_;
                    state.value = std::move(value.value);
                    state.quality = qualityOf(value.status);
                    state.timeStamp = now;
                }
                if (!ok) trace("read refused", s);
            }
            done();
        });
    return true;
}

void UaServerBackend::detach(UaItem& item) {
    items_.erase(item.handle_);
    if (item.monitored_ && item.subscription_) {
        doomed_.emplace_back(item.subscription_, item.monitored_);
        scanChanged();
    }
}

void UaServerBackend::scanChanged() {
    if (syncPosted_) return;
    syncPosted_ = true;
    const std::weak_ptr<bool> alive = alive_;
    loop_.post([this, alive] {
        if (alive.expired()) return;
        syncPosted_ = false;
        sync();
    });
}

void UaServerBackend::badQuality(int32_t quality) {
    const DateTime now = clock_.now();
    for (auto& [handle, item] : items_) {
        if (item->state_.quality == quality) continue;
        item->state_.quality = quality;
        item->state_.timeStamp = now;
    }
}

void UaServerBackend::onState(UaClient::State s) {
    wake();
    if (s == UaClient::State::Active) {
        trace(everActive_ ? "session is back" : "session active", 0, IncidentKind::Opened);
        everActive_ = true;
        subscriptions_.clear();
        doomed_.clear();
        syncing_ = false;
        for (auto& [handle, item] : items_) {
            item->resolved_ = false;
            item->failed_ = false;
            item->monitored_ = 0;
            item->subscription_ = 0;
        }
        resolveAll();
    } else if (s == UaClient::State::Backoff) {
        syncing_ = false;
        badQuality(everActive_ ? opc::OPC_QUALITY_COMM_FAILURE : opc::OPC_QUALITY_NOT_CONNECTED);
    }
}

void UaServerBackend::resolveAll() {
    if (client_->state() != UaClient::State::Active) return;
    std::vector<UaItem*> batch;
    for (auto& [handle, item] : items_) {
        if (item->resolved_ || item->failed_) continue;
        if (!item->node_.namespaceUri.empty()) {
            const auto& ns = client_->namespaces();
            const auto it = std::find(ns.begin(), ns.end(), item->node_.namespaceUri);
            if (it == ns.end()) {
                item->failed_ = true;
                item->state_.quality = opc::OPC_QUALITY_CONFIG_ERROR;
                trace("item " + item->itemID_ + ": the server has no namespace " +
                          item->node_.namespaceUri,
                      status::BadNodeIdUnknown);
                continue;
            }
            item->resolved_node_ = item->node_;
            item->resolved_node_.namespaceUri.clear();
            item->resolved_node_.ns = static_cast<uint16_t>(it - ns.begin());
        } else {
            item->resolved_node_ = item->node_;
        }
        batch.push_back(item);
    }
    if (batch.empty()) {
        scanChanged();
        return;
    }
    std::vector<uint32_t> handles;
    for (UaItem* item : batch) handles.push_back(item->handle_);
    std::vector<NodeId> nodes;
    for (UaItem* item : batch) nodes.push_back(item->resolved_node_);
    const std::weak_ptr<bool> alive = alive_;
    client_->call(
        msg::ReadRequest, msg::ReadResponse,
        [&nodes](std::vector<Value>& v) {
            AddValue(v).real = 0;
            AddNumber(v, 0);  // source time stamps
            AddLength(v, static_cast<uint32_t>(nodes.size() * 2));
            for (const NodeId& node : nodes) {
                for (uint32_t attribute : {attr::UserAccessLevel, attr::Value}) {
                    AddValue(v).node = node;
                    AddNumber(v, attribute);
                    AddValue(v).null = true;
                    AddValue(v).null = true;
                }
            }
        },
        [this, alive, handles](uint32_t s, std::vector<Value>& v) {
            if (alive.expired()) return;
            const size_t i = AfterHeader(v);
            const bool ok = !IsBad(s) && v.size() > i && v[i].count == handles.size() * 2;
            const DateTime now = clock_.now();
            for (size_t k = 0; k < handles.size(); ++k) {
                const auto it = items_.find(handles[k]);
                if (it == items_.end()) continue;
                UaItem& item = *it->second;
                if (!ok) {
                    // The session went meanwhile: the next one checks the item again.
                    continue;
                }
                DataValue& access = v[i + 1 + 2 * k].data;
                DataValue& value = v[i + 2 + 2 * k].data;
                const uint32_t refused = IsBad(access.status) ? access.status : value.status;
                if (IsBad(access.status) || (IsBad(value.status) && (value.status & 0xFFFF0000u) ==
                                                                        status::BadNodeIdUnknown)) {
                    item.failed_ = true;
                    item.dataType_ = BuiltIn::Null;
                    item.state_.quality = opc::OPC_QUALITY_CONFIG_ERROR;
                    item.state_.timeStamp = now;
                    trace("item " + item.itemID_ + " refused", refused);
                    continue;
                }
                item.accessLevel_ =
                    access.value.isNumber() ? static_cast<uint8_t>(access.value.integer()) : 0;
                item.dataType_ = value.type;
                item.array_ = value.array;
                item.state_.value = std::move(value.value);
                item.state_.quality = qualityOf(value.status);
                item.state_.timeStamp = now;
                item.resolved_ = true;
            }
            wake();
            scanChanged();
        });
}

void UaServerBackend::dataChange(uint32_t, uint32_t handle, DataValue& value) {
    const auto it = items_.find(handle);
    if (it == items_.end()) return;
    OpcItemState& state = it->second->state_;
    state.value = std::move(value.value);
    state.quality = qualityOf(value.status);
    state.timeStamp = clock_.now();
}

void UaServerBackend::sync() {
    if (syncing_ || client_->state() != UaClient::State::Active) return;
    const std::weak_ptr<bool> alive = alive_;
    // Each step sends one request; its answer runs sync() again for the next step.
    auto next = [this, alive] {
        if (alive.expired()) return;
        syncing_ = false;
        sync();
    };

    // 1. Monitored items of removed items, or of items whose rate changed.
    for (auto& [handle, item] : items_) {
        if (item->monitored_ && item->monitoredRate_ != item->scan_.updateRate) {
            doomed_.emplace_back(item->subscription_, item->monitored_);
            item->monitored_ = 0;
        }
    }
    if (!doomed_.empty()) {
        const uint32_t sub = doomed_.front().first;
        std::vector<uint32_t> ids;
        std::erase_if(doomed_, [&](const auto& d) {
            if (d.first != sub) return false;
            ids.push_back(d.second);
            return true;
        });
        syncing_ = true;
        client_->call(
            msg::DeleteMonitoredItemsRequest, msg::StatusResultsResponse,
            [sub, &ids](std::vector<Value>& v) {
                AddNumber(v, sub);
                AddLength(v, static_cast<uint32_t>(ids.size()));
                for (uint32_t id : ids) AddNumber(v, id);
            },
            [next](uint32_t, std::vector<Value>&) { next(); });
        return;
    }

    // 2. A subscription for each update rate in use.
    std::map<int32_t, bool> rates;  // rate, any item active
    for (auto& [handle, item] : items_) {
        if (!item->resolved_ || !item->scanned_) continue;
        rates[item->scan_.updateRate] = rates[item->scan_.updateRate] || item->scan_.active;
    }
    for (const auto& [rate, active] : rates) {
        if (subscriptions_.count(rate)) continue;
        syncing_ = true;
        const double interval = rate;
        // Keep-alives about every 2 s, so a silent server is noticed in time.
        const auto keepAlive = static_cast<uint32_t>(std::max(1, 2000 / std::max(rate, 1)));
        const bool publishing = active;
        const int32_t r = rate;
        client_->call(
            msg::CreateSubscriptionRequest, msg::CreateSubscriptionResponse,
            [=](std::vector<Value>& v) {
                AddValue(v).real = interval;
                AddNumber(v, keepAlive * 3);
                AddNumber(v, keepAlive);
                AddNumber(v, 0);
                AddNumber(v, publishing ? 1 : 0);
                AddNumber(v, 0);
            },
            [this, alive, r, publishing, next](uint32_t s, std::vector<Value>& v) {
                if (alive.expired()) return;
                const size_t i = AfterHeader(v);
                if (IsBad(s) || v.size() <= i) {
                    trace("subscription refused", s);
                    syncing_ = false;
                    return;
                }
                subscriptions_[r] = Subscription{static_cast<uint32_t>(v[i].number), publishing};
                client_->publishing(true);
                next();
            });
        return;
    }

    // 3. Monitored items for the items that have none, one subscription at a time.
    for (const auto& [rate, sub] : subscriptions_) {
        std::vector<UaItem*> batch;
        for (auto& [handle, item] : items_) {
            if (item->resolved_ && item->scanned_ && !item->monitored_ &&
                item->scan_.updateRate == rate)
                batch.push_back(item);
        }
        if (batch.empty()) continue;
        syncing_ = true;
        std::vector<std::pair<uint32_t, NodeId>> nodes;
        std::vector<uint32_t> handles;
        std::vector<bool> modes;
        for (UaItem* item : batch) {
            handles.push_back(item->handle_);
            modes.push_back(item->scan_.active);
        }
        const uint32_t subId = sub.id;
        const int32_t r = rate;
        client_->call(
            msg::CreateMonitoredItemsRequest, msg::CreateMonitoredItemsResponse,
            [&](std::vector<Value>& v) {
                AddNumber(v, subId);
                AddNumber(v, 0);
                AddLength(v, static_cast<uint32_t>(batch.size()));
                for (UaItem* item : batch) {
                    AddValue(v).node = item->resolved_node_;
                    AddNumber(v, attr::Value);
                    AddValue(v).null = true;
                    AddValue(v).null = true;
                    AddNumber(v, item->scan_.active ? MonitoringReporting : MonitoringDisabled);
                    AddNumber(v, item->handle_);
                    AddValue(v).real = r;
                    AddValue(v);  // no filter
                    AddNumber(v, 1);
                    AddNumber(v, 1);
                }
            },
            [this, alive, handles, modes, subId, r, next](uint32_t s, std::vector<Value>& v) {
                if (alive.expired()) return;
                const size_t i = AfterHeader(v);
                const bool ok = !IsBad(s) && v.size() > i && v[i].count == handles.size();
                for (size_t k = 0; k < handles.size(); ++k) {
                    const auto it = items_.find(handles[k]);
                    if (it == items_.end()) continue;
                    UaItem& item = *it->second;
                    const uint32_t st = ok ? static_cast<uint32_t>(v[i + 1 + 5 * k].number) : s;
                    if (IsBad(st)) {
                        item.failed_ = true;
                        item.resolved_ = false;
                        item.state_.quality = qualityOf(st) ? qualityOf(st) : opc::OPC_QUALITY_CONFIG_ERROR;
                        trace("monitored item " + item.itemID_ + " refused", st);
                        continue;
                    }
                    item.monitored_ = static_cast<uint32_t>(v[i + 2 + 5 * k].number);
                    item.subscription_ = subId;
                    item.monitoredRate_ = r;
                    item.monitoredActive_ = modes[k];
                }
                next();
            });
        return;
    }

    // 4. Monitoring modes that differ from the groups' IsActive.
    for (const auto& [rate, sub] : subscriptions_) {
        for (bool active : {true, false}) {
            std::vector<uint32_t> ids;
            std::vector<uint32_t> handles;
            for (auto& [handle, item] : items_) {
                if (item->monitored_ && item->subscription_ == sub.id &&
                    item->scan_.active == active && item->monitoredActive_ != active) {
                    ids.push_back(item->monitored_);
                    handles.push_back(handle);
                    item->monitoredActive_ = active;
                }
            }
            if (ids.empty()) continue;
            syncing_ = true;
            const uint32_t subId = sub.id;
            client_->call(
                msg::SetMonitoringModeRequest, msg::StatusResultsResponse,
                [&](std::vector<Value>& v) {
                    AddNumber(v, subId);
                    AddNumber(v, active ? MonitoringReporting : MonitoringDisabled);
                    AddLength(v, static_cast<uint32_t>(ids.size()));
                    for (uint32_t id : ids) AddNumber(v, id);
                },
                [next](uint32_t, std::vector<Value>&) { next(); });
            return;
        }
    }

    // 5. Publishing on while some item of the subscription is active; subscriptions no item
    //    uses any more go.
    for (auto it = subscriptions_.begin(); it != subscriptions_.end(); ++it) {
        const auto rate = rates.find(it->first);
        const uint32_t subId = it->second.id;
        if (rate == rates.end()) {
            subscriptions_.erase(it);
            syncing_ = true;
            client_->call(
                msg::DeleteSubscriptionsRequest, msg::StatusResultsResponse,
                [subId](std::vector<Value>& v) {
                    AddLength(v, 1);
                    AddNumber(v, subId);
                },
                [next](uint32_t, std::vector<Value>&) { next(); });
            return;
        }
        if (rate->second == it->second.publishing) continue;
        it->second.publishing = rate->second;
        syncing_ = true;
        const bool on = rate->second;
        client_->call(
            msg::SetPublishingModeRequest, msg::StatusResultsResponse,
            [subId, on](std::vector<Value>& v) {
                AddNumber(v, on ? 1 : 0);
                AddLength(v, 1);
                AddNumber(v, subId);
            },
            [next](uint32_t, std::vector<Value>&) { next(); });
        return;
    }
}

}  // namespace maroset::platform::opcua
