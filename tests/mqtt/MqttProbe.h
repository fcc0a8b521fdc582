#pragma once

#include <string>
#include <vector>

struct mosquitto;

namespace maroset::test {

// A broker client of the test's own, beside the service: subscribes, records what it
// receives, publishes commands. Pumped by the test (pump()), so it needs no thread either.
class MqttProbe {
  public:
    struct Message {
        std::string topic;
        std::string payload;
        bool retained = false;
    };

    MqttProbe(int port, const std::string& subscription);
    ~MqttProbe();
    MqttProbe(const MqttProbe&) = delete;
    MqttProbe& operator=(const MqttProbe&) = delete;

    bool subscribed() const { return subscribed_; }
    void pump();
    void publish(const std::string& topic, const std::string& payload, bool retain = false);
    // The messages received on one topic, oldest first.
    std::vector<Message> on(const std::string& topic) const;

    std::vector<Message> messages;

  private:
    mosquitto* mosq_;
    std::string subscription_;
    bool subscribed_ = false;
};

}  // namespace maroset::test
