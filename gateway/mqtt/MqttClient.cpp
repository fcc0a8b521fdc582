#include "gateway/mqtt/MqttClient.h"

#include <mosquitto.h>

#include <algorithm>

namespace maroset::gateway {

namespace {

using platform::EventLoop;
using std::chrono::milliseconds;

constexpr int kKeepAliveSeconds = 30;
constexpr milliseconds kHousekeeping{1000};
constexpr milliseconds kFirstBackoff{1000};
constexpr milliseconds kLongestBackoff{30000};
// Packets handled per readiness: a client that floods us cannot keep the loop from the drivers.
constexpr int kPacketsPerTurn = 64;

void InitLibraryOnce() {
    static const int once = mosquitto_lib_init();
    (void)once;
}

}  // namespace

MqttClient::MqttClient(EventLoop& loop, const MqttOptions& options)
    : loop_(loop), options_(options), endpoint_(options.endpoint()) {
    InitLibraryOnce();
    mosq_ = mosquitto_new(options_.clientId.empty() ? nullptr : options_.clientId.c_str(), true,
                          this);
    if (!mosq_) throw std::runtime_error("cannot make an MQTT client");
    mosquitto_int_option(mosq_, MOSQ_OPT_PROTOCOL_VERSION, MQTT_PROTOCOL_V311);
    mosquitto_int_option(mosq_, MOSQ_OPT_TCP_NODELAY, 1);
    // Acknowledged messages are not held back behind a window: the loop keeps up with the drivers.
    mosquitto_max_inflight_messages_set(mosq_, 0);
    if (!options_.user.empty())
        mosquitto_username_pw_set(mosq_, options_.user.c_str(),
                                  options_.password.empty() ? nullptr : options_.password.c_str());
    if (options_.tls &&
        mosquitto_tls_set(mosq_, options_.caFile.c_str(), nullptr, nullptr, nullptr, nullptr) !=
            MOSQ_ERR_SUCCESS)
        throw std::runtime_error("cannot use the MQTT CA file " + options_.caFile);
    mosquitto_connect_callback_set(mosq_, &MqttClient::OnConnect);
    mosquitto_disconnect_callback_set(mosq_, &MqttClient::OnDisconnect);
    mosquitto_message_callback_set(mosq_, &MqttClient::OnMessage);
}

MqttClient::~MqttClient() {
    *alive_ = false;
    unwatch();
    if (timer_) loop_.cancel(timer_);
    mosquitto_destroy(mosq_);
}

void MqttClient::start() {
    if (state_ == State::Idle) connect();
}

void MqttClient::setWill(const std::string& topic, std::string_view payload, int qos,
                         bool retain) {
    mosquitto_will_set(mosq_, topic.c_str(), static_cast<int>(payload.size()), payload.data(),
                       qos, retain);
}

bool MqttClient::publish(const std::string& topic, std::string_view payload, int qos,
                         bool retain) {
    if (state_ != State::Connected) return false;
    if (mosquitto_publish(mosq_, nullptr, topic.c_str(), static_cast<int>(payload.size()),
                          payload.data(), qos, retain) != MOSQ_ERR_SUCCESS)
        return false;
    ++counters_.messagesOut;
    counters_.bytesOut += topic.size() + payload.size();
    rearm();
    return true;
}

bool MqttClient::subscribe(const std::string& pattern, int qos) {
    if (state_ != State::Connected) return false;
    const bool ok = mosquitto_subscribe(mosq_, nullptr, pattern.c_str(), qos) == MOSQ_ERR_SUCCESS;
    rearm();
    return ok;
}

void MqttClient::restart() {
    if (state_ != State::Connected) return;
    // Outside libmosquitto's callbacks, so the DISCONNECT is written before the socket goes.
    loop_.post([this, alive = std::weak_ptr<bool>(alive_)] {
        if (alive.expired() || state_ != State::Connected) return;
        mosquitto_disconnect(mosq_);
        lost("restarted");
    });
}

void MqttClient::connect() {
    state_ = State::Connecting;
    const std::weak_ptr<bool> alive = alive_;
    Connecting.raise();
    if (alive.expired()) return;
    const int rc = mosquitto_connect_async(mosq_, options_.host.c_str(), options_.port,
                                           kKeepAliveSeconds);
    if (rc != MOSQ_ERR_SUCCESS) {
        lost(rc == MOSQ_ERR_ERRNO ? "cannot connect to " + endpoint_ : mosquitto_strerror(rc));
        return;
    }
    rearm();
    timer_ = loop_.schedule(kHousekeeping, [this] { housekeeping(); });
}

void MqttClient::housekeeping() {
    timer_ = 0;
    const std::weak_ptr<bool> alive = alive_;
    const int rc = mosquitto_loop_misc(mosq_);
    if (alive.expired() || state_ == State::Waiting) return;
    if (rc != MOSQ_ERR_SUCCESS) {
        lost(mosquitto_strerror(rc));
        return;
    }
    rearm();
    timer_ = loop_.schedule(kHousekeeping, [this] { housekeeping(); });
}

void MqttClient::ready(short revents) {
    const std::weak_ptr<bool> alive = alive_;
    if (revents & (EventLoop::Readable | EventLoop::Error | EventLoop::HangUp)) {
        const int rc = mosquitto_loop_read(mosq_, kPacketsPerTurn);
        if (alive.expired() || state_ == State::Waiting) return;
        if (rc != MOSQ_ERR_SUCCESS) {
            lost(rc == MOSQ_ERR_ERRNO ? "cannot reach " + endpoint_ : mosquitto_strerror(rc));
            return;
        }
    }
    if (revents & EventLoop::Writable) {
        const int rc = mosquitto_loop_write(mosq_, kPacketsPerTurn);
        if (alive.expired() || state_ == State::Waiting) return;
        if (rc != MOSQ_ERR_SUCCESS) {
            lost(mosquitto_strerror(rc));
            return;
        }
    }
    rearm();
}

void MqttClient::lost(const std::string& why) {
    if (state_ == State::Waiting) return;  // libmosquitto and we may both tell the same loss
    state_ = State::Waiting;
    unwatch();
    if (timer_) loop_.cancel(timer_);
    timer_ = loop_.schedule(backoff_, [this] {
        timer_ = 0;
        connect();
    });
    backoff_ = std::min(backoff_ * 2, kLongestBackoff);
    Disconnected.raise(why);
}

void MqttClient::rearm() {
    const int fd = mosquitto_socket(mosq_);
    if (fd < 0 || (state_ != State::Connecting && state_ != State::Connected)) {
        unwatch();
        return;
    }
    const short want = EventLoop::Readable | (mosquitto_want_write(mosq_) ? EventLoop::Writable : 0);
    if (watch_ && want == watching_) return;
    unwatch();
    watch_ = loop_.watch(fd, want, [this](short revents) { ready(revents); });
    watching_ = want;
}

void MqttClient::unwatch() {
    if (watch_) loop_.unwatch(watch_);
    watch_ = 0;
    watching_ = 0;
}

void MqttClient::OnConnect(mosquitto*, void* self, int rc) {
    auto& c = *static_cast<MqttClient*>(self);
    if (rc != 0) {
        c.lost(std::string("refused: ") + mosquitto_connack_string(rc));
        return;
    }
    c.state_ = State::Connected;
    c.backoff_ = kFirstBackoff;
    if (c.everConnected_) ++c.counters_.reconnects;
    c.everConnected_ = true;
    c.Connected.raise();
}

void MqttClient::OnDisconnect(mosquitto*, void* self, int rc) {
    auto& c = *static_cast<MqttClient*>(self);
    c.lost(rc == 0 ? "disconnected" : mosquitto_strerror(rc));
}

void MqttClient::OnMessage(mosquitto*, void* self, const mosquitto_message* msg) {
    auto& c = *static_cast<MqttClient*>(self);
    // A message larger than any command we take is dropped unread.
    if (msg->payloadlen < 0 || static_cast<uint32_t>(msg->payloadlen) > kMaxIncoming) return;
    c.Message.raise(msg->topic,
                    std::string_view(static_cast<const char*>(msg->payload),
                                     static_cast<size_t>(msg->payloadlen)));
}

}  // namespace maroset::gateway
