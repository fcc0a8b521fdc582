#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "gateway/mqtt/MqttOptions.h"
#include "lang/Event.h"
#include "platform/EventLoop.h"

struct mosquitto;
struct mosquitto_message;

namespace maroset::gateway {

// What the MQTT side has done since the service started; the numbers only grow.
struct MqttCounters {
    uint64_t messagesOut = 0;
    uint64_t bytesOut = 0;  // topic and payload bytes handed to the broker connection
    uint64_t reconnects = 0;
};

// One connection to a broker, driven by the host's loop: libmosquitto's socket is a watched
// descriptor and its housekeeping a timer, so the client has no thread and never blocks.
//
//   Idle --start--> Connecting --CONNACK--> Connected --lost--> Waiting --back-off--> Connecting
//                        \--refused or failed--> Waiting
//
// Waiting lasts 1 s after the first loss and doubles up to 30 s; a connection that is
// accepted starts the back-off afresh. Connecting is raised before every connect, the place
// to set the will for it. Handlers run on the loop and may publish; Message handlers run while
// libmosquitto reads, so what they publish is sent when the socket is next writable.
class MqttClient {
  public:
    enum class State : uint8_t { Idle, Connecting, Connected, Waiting };

    MqttClient(platform::EventLoop& loop, const MqttOptions& options);
    ~MqttClient();
    MqttClient(const MqttClient&) = delete;
    MqttClient& operator=(const MqttClient&) = delete;

    void start();
    State state() const { return state_; }
    const MqttCounters& counters() const { return counters_; }
    // The broker as "host:port".
    const std::string& endpoint() const { return endpoint_; }

    // The will the next connect leaves with the broker.
    void setWill(const std::string& topic, std::string_view payload, int qos, bool retain);
    // False when not connected (nothing is queued for later: the caller keeps what it must).
    bool publish(const std::string& topic, std::string_view payload, int qos, bool retain);
    bool subscribe(const std::string& pattern, int qos);
    // Ends the connection cleanly (the broker drops the will) and reconnects after the
    // back-off, as after a loss.
    void restart();

    Event<> Connecting;
    Event<> Connected;
    // Why the connection ended or was refused.
    Event<const std::string&> Disconnected;
    Event<const std::string&, std::string_view> Message;

    // The largest message handed to Message handlers; a bigger one is dropped.
    static constexpr uint32_t kMaxIncoming = 256 * 1024;

  private:
    static void OnConnect(mosquitto*, void* self, int rc);
    static void OnDisconnect(mosquitto*, void* self, int rc);
    static void OnMessage(mosquitto*, void* self, const mosquitto_message* msg);

    void connect();
    void lost(const std::string& why);
    void ready(short revents);
    void housekeeping();
    // Watches the socket for what libmosquitto wants now (reading always, writing when it
    // has bytes queued).
    void rearm();
    void unwatch();

    platform::EventLoop& loop_;
    MqttOptions options_;
    std::string endpoint_;
    mosquitto* mosq_ = nullptr;
    State state_ = State::Idle;
    MqttCounters counters_;
    bool everConnected_ = false;
    platform::EventLoop::Duration backoff_{1000};
    platform::EventLoop::WatchId watch_ = 0;
    short watching_ = 0;
    platform::EventLoop::TimerId timer_ = 0;  // housekeeping while connecting or connected,
                                              // the back-off while waiting
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::gateway
