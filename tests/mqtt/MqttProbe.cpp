#include "MqttProbe.h"

#include <mosquitto.h>

#include <stdexcept>

namespace maroset::test {

MqttProbe::MqttProbe(int port, const std::string& subscription)
    : mosq_(nullptr), subscription_(subscription) {
    mosquitto_lib_init();
    mosq_ = mosquitto_new(nullptr, true, this);
    mosquitto_connect_callback_set(mosq_, [](mosquitto* m, void* self, int rc) {
        auto& p = *static_cast<MqttProbe*>(self);
        if (rc == 0) mosquitto_subscribe(m, nullptr, p.subscription_.c_str(), 1);
    });
    mosquitto_subscribe_callback_set(mosq_, [](mosquitto*, void* self, int, int, const int*) {
        static_cast<MqttProbe*>(self)->subscribed_ = true;
    });
    mosquitto_message_callback_set(mosq_, [](mosquitto*, void* self, const mosquitto_message* m) {
        static_cast<MqttProbe*>(self)->messages.push_back(
            {m->topic, std::string(static_cast<const char*>(m->payload), m->payloadlen), m->retain});
    });
    if (mosquitto_connect(mosq_, "127.0.0.1", port, 30) != MOSQ_ERR_SUCCESS)
        throw std::runtime_error("probe cannot connect");
}

MqttProbe::~MqttProbe() {
    mosquitto_destroy(mosq_);
}

void MqttProbe::pump() {
    mosquitto_loop(mosq_, 0, 100);
}

void MqttProbe::publish(const std::string& topic, const std::string& payload, bool retain) {
    mosquitto_publish(mosq_, nullptr, topic.c_str(), static_cast<int>(payload.size()),
                      payload.data(), 1, retain);
}

std::vector<MqttProbe::Message> MqttProbe::on(const std::string& topic) const {
    std::vector<Message> out;
    for (const Message& m : messages)
        if (m.topic == topic) out.push_back(m);
    return out;
}

}  // namespace maroset::test
