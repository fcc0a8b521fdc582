#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "core/Runtime.h"
#include "gateway/JsonWriter.h"
#include "gateway/TagDirectory.h"
#include "gateway/WallTime.h"
#include "gateway/mqtt/MqttClient.h"
#include "gateway/mqtt/MqttOptions.h"
#include "gateway/mqtt/MqttSession.h"
#include "gateway/mqtt/ValueBuffer.h"
#include "lang/Subscription.h"

namespace maroset::gateway {

// The MQTT side at a glance, for the node list (`$mqtt`) and the metrics.
struct MqttStatus {
    std::string endpoint;
    std::string state;  // "connecting", "connected", "waiting" (for the next attempt), "idle"
    bool connected = false;
    uint64_t messagesOut = 0;
    uint64_t bytesOut = 0;
    uint64_t buffered = 0;
    uint64_t dropped = 0;
    uint64_t reconnects = 0;

    // The `$mqtt` entry of the node list: {"name":"$mqtt","driver":"MQTT","endpoint",
    // "link":{"state","connected","messagesOut","bytesOut","buffered","dropped","reconnects"}}.
    void writeJson(JsonWriter& j) const;
    // The metrics in Prometheus text: maroset_mqtt_connected, maroset_mqtt_messages_out_total,
    // maroset_mqtt_bytes_out_total, maroset_mqtt_buffered, maroset_mqtt_dropped_total,
    // maroset_mqtt_reconnects_total.
    std::string prometheus() const;
};

// Publishes a running project to an MQTT broker, as plain JSON topics or as a Sparkplug B edge
// node (MqttOptions::sparkplug). It only observes what every host can: the reports of each node
// (Runtime::reports) and the link status board; and it writes only through a node's WriteTag,
// only when the options allow writes. The drivers never wait for the broker: while it is away,
// changes are kept in a bounded buffer (oldest dropped first, counted and traced) and replayed
// after the reconnect.
//
// Tags are published by the names the directory gives them; a report for a handle the
// directory does not know is not published. The directory must outlive the publisher.
class MqttPublisher {
  public:
    MqttPublisher(Runtime& runtime, TagDirectory& tags, MqttOptions options);
    ~MqttPublisher();
    MqttPublisher(const MqttPublisher&) = delete;
    MqttPublisher& operator=(const MqttPublisher&) = delete;

    // Connects, and keeps connecting, until the publisher is destroyed.
    void start();
    MqttStatus status() const;
    // The name the MQTT side goes by in link incidents and the node list.
    static constexpr std::string_view kName = "$mqtt";

  private:
    void values(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                const VbArray<Variant>& values);
    void keep(TagChange change);
    std::string write(const TagEntry& tag, const Variant& value);
    void tell(platform::IncidentKind kind, const std::string& text);

    Runtime& runtime_;
    TagDirectory& tags_;
    MqttOptions options_;
    MqttClient client_;
    ValueBuffer buffer_;
    WallTime wall_;
    MqttContext context_;
    std::unique_ptr<MqttSession> session_;
    uint64_t droppedBefore_ = 0;  // dropped count when the broker was last lost
    std::vector<Subscription> subscriptions_;
};

}  // namespace maroset::gateway
