// What broker clients send to the service's command topics: a `set` payload in JSON, an NCMD
// or DCMD payload in Sparkplug B. Whatever the bytes, each parser answers a value or a refusal
// with a reason, never both and never neither, and stays within its bounds.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "gateway/mqtt/MqttCommand.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    using namespace maroset::gateway;
    const std::string_view payload(reinterpret_cast<const char*>(data), size);

    std::string error;
    const auto value = MqttCommand::ParseSet(payload, error);
    if (value.has_value() == !error.empty()) std::abort();

    error.clear();
    const auto writes = MqttCommand::ParseSparkplug(payload, error);
    if (writes.has_value() == !error.empty()) std::abort();
    if (writes && writes->size() > MqttCommand::kMaxMetrics) std::abort();
    return 0;
}
