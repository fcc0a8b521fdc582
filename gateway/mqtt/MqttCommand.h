#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "lang/Variant.h"

namespace maroset::gateway {

// A write a broker client asks for: the metric's name, or its alias when a Sparkplug host
// sends only that, and the value.
struct MetricWrite {
    std::string name;
    std::optional<uint64_t> alias;
    Variant value;
};

// Reads what clients send to the service's command topics. Everything here is hostile input:
// sizes are bounded, nothing is trusted, and a payload that does not parse is refused with a
// message for the sender, never half applied.
class MqttCommand {
  public:
    static constexpr size_t kMaxSetPayload = 4096;
    static constexpr size_t kMaxSparkplugPayload = 64 * 1024;
    static constexpr size_t kMaxMetrics = 1000;

    // A `set` payload: {"value": V} or a bare JSON value V, where V is a number, a string,
    // true, false or null, read as the HTTP API reads a written value. Empty result and
    // `error` set when the payload is refused.
    static std::optional<Variant> ParseSet(std::string_view payload, std::string& error);

    // An NCMD or DCMD payload: every metric with a name or an alias. Empty result and
    // `error` set when the payload is refused.
    static std::optional<std::vector<MetricWrite>> ParseSparkplug(std::string_view payload,
                                                                   std::string& error);
};

}  // namespace maroset::gateway
