#include "gateway/mqtt/MqttOptions.h"

#include <charconv>
#include <fstream>
#include <stdexcept>

namespace maroset::gateway {

namespace {

// A topic level we build from the user's words: wildcards and separators would change
// which topics it names.
bool IsTopicLevel(std::string_view s) {
    return !s.empty() && s.size() <= 256 && s.find_first_of("/+#") == std::string_view::npos;
}

std::string ReadPasswordFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) throw std::invalid_argument("cannot read the MQTT password file " + path);
    std::string line;
    // A password file is one line; anything longer than this is not one.
    char c;
    while (in.get(c) && c != '\n') {
        if (line.size() == 1024) throw std::invalid_argument("MQTT password file too long");
        line.push_back(c);
    }
    if (!line.empty() && line.back() == '\r') line.pop_back();
    return line;
}

}  // namespace

std::string MqttOptions::endpoint() const {
    return host + ":" + std::to_string(port);
}

void MqttOptions::setUrl(std::string_view url) {
    std::string_view rest;
    if (url.starts_with("mqtt://")) {
        tls = false;
        rest = url.substr(7);
    } else if (url.starts_with("mqtts://")) {
        tls = true;
        rest = url.substr(8);
    } else {
        throw std::invalid_argument("--mqtt wants mqtt://HOST[:PORT] or mqtts://HOST[:PORT]");
    }
    if (!rest.empty() && rest.back() == '/') rest.remove_suffix(1);
    port = tls ? 8883 : 1883;
    const size_t colon = rest.rfind(':');
    if (colon != std::string_view::npos) {
        const std::string_view digits = rest.substr(colon + 1);
        int p = 0;
        const auto [end, ec] = std::from_chars(digits.data(), digits.data() + digits.size(), p);
        if (ec != std::errc() || end != digits.data() + digits.size() || p < 1 || p > 65535)
            throw std::invalid_argument("bad port in --mqtt " + std::string(url));
        port = p;
        rest = rest.substr(0, colon);
    }
    if (rest.empty()) throw std::invalid_argument("no host in --mqtt " + std::string(url));
    host = rest;
}

void MqttOptions::setSparkplug(std::string_view id) {
    const size_t slash = id.find('/');
    if (slash == std::string_view::npos || !IsTopicLevel(id.substr(0, slash)) ||
        !IsTopicLevel(id.substr(slash + 1)))
        throw std::invalid_argument("--sparkplug wants GROUP/EDGE");
    group = id.substr(0, slash);
    edge = id.substr(slash + 1);
}

bool MqttOptions::take(std::string_view flag, const std::function<std::string()>& value) {
    if (flag == "--mqtt") {
        setUrl(value());
    } else if (flag == "--mqtt-ca") {
        caFile = value();
    } else if (flag == "--mqtt-user") {
        user = value();
    } else if (flag == "--mqtt-password-file") {
        password = ReadPasswordFile(value());
    } else if (flag == "--mqtt-client-id") {
        clientId = value();
        if (clientId.empty() || clientId.size() > 256)
            throw std::invalid_argument("--mqtt-client-id wants 1 to 256 characters");
    } else if (flag == "--mqtt-prefix") {
        prefix = value();
        if (!IsTopicLevel(prefix)) throw std::invalid_argument("--mqtt-prefix wants one topic level");
    } else if (flag == "--mqtt-buffer") {
        const std::string text = value();
        size_t n = 0;
        const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), n);
        if (ec != std::errc() || end != text.data() + text.size())
            throw std::invalid_argument("--mqtt-buffer wants a number of values");
        bufferLimit = n;
    } else if (flag == "--sparkplug") {
        setSparkplug(value());
    } else if (flag == "--sparkplug-host") {
        primaryHost = value();
        if (!IsTopicLevel(primaryHost)) throw std::invalid_argument("--sparkplug-host wants an id");
    } else {
        return false;
    }
    return true;
}

void MqttOptions::validate() const {
    if (!enabled() && (sparkplug() || !user.empty() || !caFile.empty()))
        throw std::invalid_argument("MQTT options need --mqtt mqtt://HOST[:PORT]");
    if (!primaryHost.empty() && !sparkplug())
        throw std::invalid_argument("--sparkplug-host needs --sparkplug GROUP/EDGE");
    if (tls && caFile.empty()) throw std::invalid_argument("mqtts:// needs --mqtt-ca FILE");
}

}  // namespace maroset::gateway
