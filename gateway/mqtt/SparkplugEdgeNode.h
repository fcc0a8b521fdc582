#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "gateway/mqtt/MqttSession.h"
#include "mqtt/sparkplug_b.pb.h"

namespace maroset::gateway {

// The service as a Sparkplug B edge node (namespace spBv1.0, group G, edge node E), each node
// of the project one device D named after it:
//
//   Offline --connected--> AwaitingHost --host online--> Born --lost--> Offline
//              \------------(no primary host)-------------/
//   Born --NCMD Node Control/Rebirth--> Born (every birth again)
//   Born --host offline--> NDEATH, reconnect (a new bdSeq) --> Offline
//
//   NBIRTH  spBv1.0/G/NBIRTH/E     bdSeq, Node Control/Rebirth, the gateway's own counters
//   NDEATH  spBv1.0/G/NDEATH/E     the will, with the bdSeq of the connect that set it
//   DBIRTH  spBv1.0/G/DBIRTH/E/D   when D's link is up: every tag a metric (name, alias,
//                                  datatype, current value)
//   DDATA   spBv1.0/G/DDATA/E/D    changes by alias, one message per device per loop turn
//   DDEATH  spBv1.0/G/DDEATH/E/D   when D's link goes down
//   NCMD, DCMD (subscribed)        rebirth; writes through WriteTag when writes are allowed
//
// seq runs 0-255 over the edge node's messages from NBIRTH on. The changes kept while the
// broker was away follow the births as historical metrics. A tag whose value changes kind
// (a Long tag reporting text) is a change of its device's definition: the device is born again.
class SparkplugEdgeNode final : public MqttSession {
  public:
    explicit SparkplugEdgeNode(MqttContext& context);

    void connecting() override;
    void connected() override;
    void disconnected() override;
    bool publishing() const override { return state_ == State::Born; }
    void change(TagChange change) override;
    void linkChanged(const LinkStatus& status) override;
    void message(const std::string& topic, std::string_view payload) override;

    // Metrics per DDATA message at most; a larger batch is split.
    static constexpr int kMetricsPerMessage = 2000;

  private:
    enum class State : uint8_t { Offline, AwaitingHost, Born };
    struct Device {
        std::string node;
        std::string topicId;  // the node's name as a topic level
        std::string dataTopic;
        bool born = false;
        sparkplug::Payload data;               // this turn's DDATA, kept for its allocations
        std::vector<const TagChange*> batch;   // the changes in `data`
    };

    void birth();
    void deviceBirth(Device& device);
    void deviceDeath(Device& device);
    void flush();
    void sendData(Device& device);
    void replay();
    bool send(const std::string& topic, sparkplug::Payload& payload);
    Device& device(std::string_view node);
    Device* deviceById(std::string_view id);
    sparkplug::DataType bornType(const TagEntry& tag) const {
        return tag.position < types_.size() ? types_[tag.position] : sparkplug::Unknown;
    }
    bool linkUp(std::string_view node) const;
    void hostState(std::string_view payload);
    void command(Device* device, std::string_view payload);
    std::string topic(std::string_view type) const;
    std::string topic(std::string_view type, const Device& device) const;
    void stamp(sparkplug::Payload& payload);

    MqttContext& c_;
    State state_ = State::Offline;
    uint64_t nextBdSeq_ = 0;
    uint64_t bdSeq_ = 0;
    uint64_t seq_ = 0;
    std::map<std::string, Device, std::less<>> devices_;  // by upper-cased node name
    std::vector<TagChange> pending_;   // this turn's changes
    std::vector<TagChange> flushing_;  // the ones being sent (both keep their capacity)
    std::string wire_;                 // the encoded payload, reused
    // Each tag's data type as its device's DBIRTH declared it, by the tag's position;
    // Unknown until then.
    std::vector<sparkplug::DataType> types_;
    bool flushPosted_ = false;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::gateway
