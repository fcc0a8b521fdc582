#pragma once

#include <cstddef>
#include <functional>
#include <string>
#include <string_view>

namespace maroset::gateway {

// How the service reaches its broker and what it publishes there, parsed once from the
// command line (`--mqtt mqtt://HOST[:PORT]` and the flags beside it).
struct MqttOptions {
    std::string host;  // empty: no MQTT
    int port = 1883;
    bool tls = false;        // mqtts://
    std::string caFile;      // --mqtt-ca
    std::string user;        // --mqtt-user
    std::string password;    // the first line of --mqtt-password-file
    std::string clientId;    // --mqtt-client-id; empty: the broker's choice
    std::string prefix = "maroset";  // --mqtt-prefix, plain JSON mode
    std::string group;       // --sparkplug GROUP/EDGE; empty: plain JSON mode
    std::string edge;
    std::string primaryHost;  // --sparkplug-host
    size_t bufferLimit = 100000;  // --mqtt-buffer: values kept while the broker is away
    bool allowWrites = false;     // the service's --allow-writes

    bool enabled() const { return !host.empty(); }
    bool sparkplug() const { return !group.empty(); }
    // "host:port", as link status shows endpoints.
    std::string endpoint() const;

    // Takes one of the flags above (not --allow-writes, which is the service's); `value`
    // fetches the flag's argument. False when the flag is not an MQTT one. A bad value
    // throws std::invalid_argument with a message for the user.
    bool take(std::string_view flag, const std::function<std::string()>& value);
    // Checks the combination once every flag is taken (throws std::invalid_argument).
    void validate() const;

    // mqtt://HOST[:PORT] or mqtts://HOST[:PORT] (default ports 1883 and 8883).
    void setUrl(std::string_view url);
    // GROUP/EDGE, each a valid Sparkplug identifier (no '/', '+' or '#').
    void setSparkplug(std::string_view id);
};

}  // namespace maroset::gateway
