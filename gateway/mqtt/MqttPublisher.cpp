#include "gateway/mqtt/MqttPublisher.h"

#include "core/node.h"
#include "core/nodeDB.h"
#include "gateway/mqtt/JsonSession.h"
#include "gateway/mqtt/SparkplugEdgeNode.h"
#include "lang/VbError.h"

namespace maroset::gateway {

using platform::IncidentKind;

MqttPublisher::MqttPublisher(Runtime& runtime, TagDirectory& tags, MqttOptions options)
    : runtime_(runtime),
      tags_(tags),
      options_(std::move(options)),
      client_(runtime.loop(), options_),
      buffer_(options_.bufferLimit),
      context_{runtime.loop(),
               runtime.clock(),
               client_,
               tags_,
               options_,
               runtime.linkStatus(),
               buffer_,
               wall_,
               [this](TagChange c) { keep(std::move(c)); },
               [this] { return buffer_.take(); },
               [this](const TagEntry& t, const Variant& v) { return write(t, v); },
               [this](const std::string& text) { tell(IncidentKind::Note, text); }} {
    if (options_.sparkplug())
        session_ = std::make_unique<SparkplugEdgeNode>(context_);
    else
        session_ = std::make_unique<JsonSession>(context_);

    subscriptions_.push_back(client_.Connecting.subscribe([this] {
        tell(IncidentKind::Opening, "connecting to " + client_.endpoint());
        session_->connecting();
    }));
    subscriptions_.push_back(client_.Connected.subscribe([this] {
        tell(IncidentKind::Opened, "connected to " + client_.endpoint());
        if (buffer_.dropped() > droppedBefore_)
            tell(IncidentKind::Dropped,
                 std::to_string(buffer_.dropped() - droppedBefore_) +
                     " changes dropped while the broker was away (buffer of " +
                     std::to_string(options_.bufferLimit) + ")");
        session_->connected();
    }));
    subscriptions_.push_back(client_.Disconnected.subscribe([this](const std::string& why) {
        droppedBefore_ = buffer_.dropped();
        tell(IncidentKind::Closed, client_.endpoint() + ": " + why);
        session_->disconnected();
    }));
    subscriptions_.push_back(client_.Message.subscribe(
        [this](const std::string& topic, std::string_view payload) {
            session_->message(topic, payload);
        }));
    subscriptions_.push_back(runtime.reports().Values.subscribe(
        [this](std::string_view node, const VbArray<int32_t>& handles, int16_t count,
               const VbArray<Variant>& values) { this->values(node, handles, count, values); }));
    subscriptions_.push_back(runtime.linkStatus().StateChanged.subscribe(
        [this](const LinkStatus& s) { session_->linkChanged(s); }));
}

MqttPublisher::~MqttPublisher() = default;

void MqttPublisher::start() {
    client_.start();
}

void MqttPublisher::values(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                           const VbArray<Variant>& values) {
    const TagDirectory::NodeTags* known = tags_.node(node);
    if (!known) return;
    const platform::DateTime now = runtime_.clock().now();
    const bool publishing = session_->publishing();
    for (int32_t i = 1; i <= count && i <= handles.UBound() && i <= values.UBound(); ++i) {
        TagEntry* tag = known->find(handles(i));
        if (!tag) continue;
        tag->value = values(i);
        tag->time = now;
        if (publishing)
            session_->change(TagChange{tag, tag->value, now});
        else
            keep(TagChange{tag, tag->value, now});
    }
}

void MqttPublisher::keep(TagChange change) {
    // The first loss of an outage is told at once; the total when the broker is back.
    if (!buffer_.push(std::move(change)) && buffer_.dropped() == droppedBefore_ + 1)
        tell(IncidentKind::Dropped, "buffer full (" + std::to_string(options_.bufferLimit) +
                                        " changes): the oldest are dropped");
}

std::string MqttPublisher::write(const TagEntry& tag, const Variant& value) {
    if (!options_.allowWrites) return "writes are not allowed (no --allow-writes)";
    const std::shared_ptr<node> n = runtime_.nodes()->getNode(tag.node);
    if (!n) return "no node " + tag.node;
    try {
        n->WriteTag(std::to_string(tag.handle), value);
    } catch (const VbError& e) {
        return "error " + std::to_string(e.number()) + ": " + e.description();
    }
    return {};
}

void MqttPublisher::tell(IncidentKind kind, const std::string& text) {
    runtime_.incidents().report(kName, kind, client_.endpoint(), [&] { return text; });
}

MqttStatus MqttPublisher::status() const {
    MqttStatus s;
    s.endpoint = client_.endpoint();
    switch (client_.state()) {
        case MqttClient::State::Idle: s.state = "idle"; break;
        case MqttClient::State::Connecting: s.state = "connecting"; break;
        case MqttClient::State::Connected: s.state = "connected"; break;
        case MqttClient::State::Waiting: s.state = "waiting"; break;
    }
    s.connected = client_.state() == MqttClient::State::Connected;
    s.messagesOut = client_.counters().messagesOut;
    s.bytesOut = client_.counters().bytesOut;
    s.buffered = buffer_.size();
    s.dropped = buffer_.dropped();
    s.reconnects = client_.counters().reconnects;
    return s;
}

void MqttStatus::writeJson(JsonWriter& j) const {
    const auto count = [](uint64_t n) { return static_cast<int64_t>(n); };
    j.beginObject().key("name").string(MqttPublisher::kName).key("driver").string("MQTT");
    j.key("endpoint").string(endpoint);
    j.key("link").beginObject().key("state").string(state).key("connected").boolean(connected);
    j.key("messagesOut").integer(count(messagesOut)).key("bytesOut").integer(count(bytesOut));
    j.key("buffered").integer(count(buffered)).key("dropped").integer(count(dropped));
    j.key("reconnects").integer(count(reconnects));
    j.endObject().endObject();
}

std::string MqttStatus::prometheus() const {
    std::string out;
    const auto family = [&](const char* name, const char* type, const char* help, uint64_t v) {
        out += std::string("# HELP ") + name + " " + help + "\n# TYPE " + name + " " + type + "\n" +
               name + " " + std::to_string(v) + "\n";
    };
    family("maroset_mqtt_connected", "gauge", "1 while the broker connection is up.", connected);
    family("maroset_mqtt_messages_out_total", "counter", "Messages published.", messagesOut);
    family("maroset_mqtt_bytes_out_total", "counter", "Topic and payload bytes published.",
           bytesOut);
    family("maroset_mqtt_buffered", "gauge", "Changes kept for the broker's return.", buffered);
    family("maroset_mqtt_dropped_total", "counter", "Changes dropped past the buffer.", dropped);
    family("maroset_mqtt_reconnects_total", "counter", "Connections made again after a loss.",
           reconnects);
    return out;
}

}  // namespace maroset::gateway
