#include "gateway/mqtt/SparkplugEdgeNode.h"

#include <set>

#include "gateway/mqtt/MqttCommand.h"
#include "gateway/mqtt/SparkplugMetric.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"
#include "lang/VbError.h"

namespace maroset::gateway {

namespace {

constexpr const char* kNamespace = "spBv1.0/";
constexpr const char* kRebirth = "Node Control/Rebirth";
// Births, data and deaths go at QoS 0 and unretained, as Sparkplug has them; the will and the
// commands we take at QoS 1.
constexpr int kDataQos = 0;
constexpr int kCommandQos = 1;
constexpr size_t kMaxStatePayload = 1024;

using Metric = sparkplug::Payload::Metric;

void AddCounter(sparkplug::Payload& payload, const char* name, uint64_t value) {
    Metric& m = *payload.add_metrics();
    m.set_name(name);
    m.set_datatype(sparkplug::UInt64);
    m.set_long_value(value);
}

void AddBdSeq(sparkplug::Payload& payload, uint64_t bdSeq) {
    Metric& m = *payload.add_metrics();
    m.set_name("bdSeq");
    m.set_datatype(sparkplug::Int64);
    m.set_long_value(bdSeq);
}

// A node's name as one topic level: separators and wildcards would change the topic.
std::string TopicLevel(std::string_view name) {
    std::string level(name);
    for (char& ch : level)
        if (ch == '/' || ch == '+' || ch == '#') ch = '_';
    return level;
}

// A primary host's STATE: {"online": true, ...} in Sparkplug 3.0, "ONLINE" before it.
bool HostOnline(std::string_view payload) {
    if (payload == "ONLINE") return true;
    const size_t key = payload.find("\"online\"");
    if (key == std::string_view::npos) return false;
    size_t at = key + 8;
    while (at < payload.size() && (payload[at] == ' ' || payload[at] == ':')) ++at;
    return payload.substr(at, 4) == "true";
}

// A value with no kind of its own says nothing about the metric's data type.
bool HasKind(const Variant& v) {
    return v.isNumber() || v.isString();
}

}  // namespace

SparkplugEdgeNode::SparkplugEdgeNode(MqttContext& context) : c_(context) {}

std::string SparkplugEdgeNode::topic(std::string_view type) const {
    return kNamespace + c_.options.group + "/" + std::string(type) + "/" + c_.options.edge;
}

std::string SparkplugEdgeNode::topic(std::string_view type, const Device& device) const {
    return topic(type) + "/" + device.topicId;
}

void SparkplugEdgeNode::stamp(sparkplug::Payload& payload) {
    payload.set_timestamp(static_cast<uint64_t>(c_.wall.epochMillis(c_.clock.now())));
    payload.set_seq(seq_);
    seq_ = (seq_ + 1) & 0xFF;
}

bool SparkplugEdgeNode::send(const std::string& topic, sparkplug::Payload& payload) {
    payload.SerializeToString(&wire_);
    return c_.client.publish(topic, wire_, kDataQos, false);
}

void SparkplugEdgeNode::connecting() {
    bdSeq_ = nextBdSeq_;
    nextBdSeq_ = (nextBdSeq_ + 1) & 0xFF;
    sparkplug::Payload death;
    death.set_timestamp(static_cast<uint64_t>(c_.wall.epochMillis(c_.clock.now())));
    AddBdSeq(death, bdSeq_);
    c_.client.setWill(topic("NDEATH"), death.SerializeAsString(), kCommandQos, false);
}

void SparkplugEdgeNode::connected() {
    c_.client.subscribe(topic("NCMD"), kCommandQos);
    c_.client.subscribe(topic("DCMD") + "/+", kCommandQos);
    if (!c_.options.primaryHost.empty()) {
        // Births wait for the host's retained STATE to say it is online.
        state_ = State::AwaitingHost;
        c_.client.subscribe(kNamespace + std::string("STATE/") + c_.options.primaryHost,
                            kCommandQos);
        return;
    }
    birth();
    replay();
}

void SparkplugEdgeNode::disconnected() {
    state_ = State::Offline;
    for (auto& [key, d] : devices_) d.born = false;
}

SparkplugEdgeNode::Device& SparkplugEdgeNode::device(std::string_view node) {
    const std::string key = UCase(node);
    auto it = devices_.find(key);
    if (it == devices_.end()) {
        it = devices_.emplace(key, Device{}).first;
        it->second.node = node;
        it->second.topicId = TopicLevel(node);
        it->second.dataTopic = topic("DDATA", it->second);
    }
    return it->second;
}

SparkplugEdgeNode::Device* SparkplugEdgeNode::deviceById(std::string_view id) {
    for (auto& [key, d] : devices_)
        if (d.topicId == id) return &d;
    return nullptr;
}

bool SparkplugEdgeNode::linkUp(std::string_view node) const {
    const LinkStatus* s = c_.links.Find(node);
    return s && (s->state == LinkState::Up || s->state == LinkState::Local);
}

void SparkplugEdgeNode::birth() {
    if (state_ == State::Born) flush();  // what this turn changed goes first, in order
    seq_ = 0;
    sparkplug::Payload payload;
    stamp(payload);
    AddBdSeq(payload, bdSeq_);
    Metric& rebirth = *payload.add_metrics();
    rebirth.set_name(kRebirth);
    rebirth.set_datatype(sparkplug::Boolean);
    rebirth.set_boolean_value(false);
    AddCounter(payload, "Gateway/Buffered", c_.buffer.size());
    AddCounter(payload, "Gateway/Dropped", c_.buffer.dropped());
    AddCounter(payload, "Gateway/Reconnects", c_.client.counters().reconnects);
    if (!send(topic("NBIRTH"), payload)) return;
    state_ = State::Born;
    for (const LinkStatus& s : c_.links.All()) {
        Device& d = device(s.node);
        d.born = false;
        if (linkUp(s.node)) deviceBirth(d);
    }
}

void SparkplugEdgeNode::deviceBirth(Device& d) {
    sparkplug::Payload payload;
    stamp(payload);
    const uint64_t now = payload.timestamp();
    types_.resize(c_.tags.all().size() + 1, sparkplug::Unknown);
    const TagDirectory::NodeTags* tags = c_.tags.node(d.node);
    for (TagEntry* tag : tags ? tags->inOrder : std::vector<TagEntry*>{}) {
        Metric& m = *payload.add_metrics();
        const sparkplug::DataType type = SparkplugMetric::TypeOf(tag->value);
        m.set_name(tag->name);
        m.set_alias(tag->position);
        m.set_datatype(type);
        m.set_timestamp(tag->time == platform::DateTime{}
                            ? now
                            : static_cast<uint64_t>(c_.wall.epochMillis(tag->time)));
        SparkplugMetric::Set(m, type, tag->value);
        types_[tag->position] = type;
    }
    d.born = send(topic("DBIRTH", d), payload);
}

void SparkplugEdgeNode::deviceDeath(Device& d) {
    flush();  // its last changes before its death
    sparkplug::Payload payload;
    stamp(payload);
    send(topic("DDEATH", d), payload);
    d.born = false;
}

void SparkplugEdgeNode::change(TagChange change) {
    pending_.push_back(std::move(change));
    if (flushPosted_) return;
    flushPosted_ = true;
    c_.loop.post([this, alive = std::weak_ptr<bool>(alive_)] {
        if (alive.expired()) return;
        flushPosted_ = false;
        flush();
    });
}

void SparkplugEdgeNode::flush() {
    if (pending_.empty()) return;
    flushing_.swap(pending_);
    if (state_ != State::Born) {
        for (TagChange& ch : flushing_) c_.keep(std::move(ch));
        flushing_.clear();
        return;
    }
    // One message per device, in the order the devices first changed this turn.
    std::vector<Device*> order;
    std::set<Device*> reborn;
    Device* d = nullptr;
    for (const TagChange& ch : flushing_) {
        if (!d || ch.tag->node != d->node) d = &device(ch.tag->node);
        if (!d->born) continue;  // its birth carries the latest value
        const sparkplug::DataType type = bornType(*ch.tag);
        if (type == sparkplug::Unknown ||
            (HasKind(ch.value) && SparkplugMetric::TypeOf(ch.value) != type)) {
            reborn.insert(d);
            continue;
        }
        if (d->batch.empty()) order.push_back(d);
        Metric& m = *d->data.add_metrics();
        m.set_alias(ch.tag->position);
        m.set_timestamp(static_cast<uint64_t>(c_.wall.epochMillis(ch.time)));
        SparkplugMetric::Set(m, type, ch.value);
        d->batch.push_back(&ch);
        if (d->data.metrics_size() == kMetricsPerMessage) sendData(*d);
    }
    for (Device* dev : order)
        if (!dev->batch.empty()) sendData(*dev);
    for (Device* dev : reborn)
        if (dev->born) deviceBirth(*dev);
    flushing_.clear();
}

void SparkplugEdgeNode::sendData(Device& d) {
    stamp(d.data);
    if (!send(d.dataTopic, d.data))
        for (const TagChange* ch : d.batch) c_.keep(*ch);
    // Cleared, not freed: the next turn's metrics reuse these.
    d.data.Clear();
    d.batch.clear();
}

void SparkplugEdgeNode::replay() {
    if (state_ != State::Born) return;
    std::deque<TagChange> kept = c_.takeKept();
    sparkplug::Payload payload;
    Device* current = nullptr;
    const auto sendRun = [&] {
        if (!current || payload.metrics_size() == 0) return true;
        stamp(payload);
        const bool sent = send(current->dataTopic, payload);
        payload.Clear();
        return sent;
    };
    // Consecutive changes of one device travel together, so the order across devices holds.
    while (!kept.empty()) {
        const TagChange& ch = kept.front();
        Device& d = device(ch.tag->node);
        const sparkplug::DataType type = bornType(*ch.tag);
        if (d.born && type != sparkplug::Unknown) {
            if (&d != current || payload.metrics_size() == kMetricsPerMessage) {
                if (!sendRun()) break;
                current = &d;
            }
            Metric& m = *payload.add_metrics();
            m.set_alias(ch.tag->position);
            m.set_timestamp(static_cast<uint64_t>(c_.wall.epochMillis(ch.time)));
            m.set_is_historical(true);
            SparkplugMetric::Set(m, type, ch.value);
        }
        kept.pop_front();
    }
    if (!sendRun() || !kept.empty())  // lost the broker again: keep the rest, in order
        for (TagChange& ch : kept) c_.keep(std::move(ch));
}

void SparkplugEdgeNode::linkChanged(const LinkStatus& status) {
    if (state_ != State::Born) return;
    Device& d = device(status.node);
    const bool up = linkUp(status.node);
    if (up && !d.born) deviceBirth(d);
    if (!up && d.born) deviceDeath(d);
}

void SparkplugEdgeNode::message(const std::string& t, std::string_view payload) {
    const std::string dcmd = topic("DCMD") + "/";
    if (t == topic("NCMD")) {
        std::string error;
        const auto writes = MqttCommand::ParseSparkplug(payload, error);
        if (!writes) {
            c_.note("NCMD refused: " + error);
            return;
        }
        for (const MetricWrite& w : *writes) {
            bool yes = false;
            try {
                yes = w.name == kRebirth && CBool(w.value);
            } catch (const VbError&) {
            }
            if (yes && state_ == State::Born) {
                birth();
                return;
            }
        }
    } else if (t.starts_with(dcmd)) {
        command(deviceById(std::string_view(t).substr(dcmd.size())), payload);
    } else if (!c_.options.primaryHost.empty() &&
               t == kNamespace + std::string("STATE/") + c_.options.primaryHost) {
        hostState(payload);
    }
}

void SparkplugEdgeNode::hostState(std::string_view payload) {
    const bool online = payload.size() <= kMaxStatePayload && HostOnline(payload);
    if (online && state_ == State::AwaitingHost) {
        birth();
        replay();
    } else if (!online && state_ == State::Born) {
        // The host is gone: die now and come back under a new bdSeq once it returns.
        sparkplug::Payload death;
        death.set_timestamp(static_cast<uint64_t>(c_.wall.epochMillis(c_.clock.now())));
        AddBdSeq(death, bdSeq_);
        c_.client.publish(topic("NDEATH"), death.SerializeAsString(), kCommandQos, false);
        state_ = State::AwaitingHost;
        c_.client.restart();
    }
}

void SparkplugEdgeNode::command(Device* d, std::string_view payload) {
    if (!d) {
        c_.note("DCMD for a device this edge node does not have");
        return;
    }
    if (!c_.options.allowWrites) {
        c_.note("DCMD for " + d->node + " refused: writes are not allowed (no --allow-writes)");
        return;
    }
    std::string error;
    const auto writes = MqttCommand::ParseSparkplug(payload, error);
    if (!writes) {
        c_.note("DCMD for " + d->node + " refused: " + error);
        return;
    }
    const std::string node = UCase(d->node);
    for (const MetricWrite& w : *writes) {
        TagEntry* tag = nullptr;
        if (w.alias && *w.alias >= 1 && *w.alias <= c_.tags.all().size()) {
            tag = &c_.tags.all()[*w.alias - 1];
            if (UCase(tag->node) != node) tag = nullptr;
        } else if (!w.alias) {
            tag = c_.tags.byName(d->node, w.name);
        }
        if (!tag) {
            c_.note("DCMD for " + d->node + ": no metric " +
                    (w.alias ? "alias " + std::to_string(*w.alias) : w.name));
            continue;
        }
        error = c_.write(*tag, w.value);
        if (!error.empty()) c_.note("DCMD " + d->node + "/" + tag->name + ": " + error);
    }
}

}  // namespace maroset::gateway
