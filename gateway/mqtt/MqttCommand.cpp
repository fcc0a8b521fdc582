#include "gateway/mqtt/MqttCommand.h"

#include "gateway/JsonReader.h"
#include "gateway/mqtt/SparkplugMetric.h"
#include "mqtt/sparkplug_b.pb.h"

namespace maroset::gateway {

std::optional<Variant> MqttCommand::ParseSet(std::string_view payload, std::string& error) {
    if (payload.size() > kMaxSetPayload) {
        error = "payload larger than " + std::to_string(kMaxSetPayload) + " bytes";
        return std::nullopt;
    }
    try {
        const JsonValue json = JsonReader::Parse(payload);
        if (json.kind != JsonValue::Kind::Object) return JsonReader::ToVariant(json);
        const JsonValue* value = json.member("value");
        if (!value) {
            error = "no \"value\" in the object";
            return std::nullopt;
        }
        return JsonReader::ToVariant(*value);
    } catch (const JsonReader::Error& e) {
        error = e.what();
        return std::nullopt;
    }
}

std::optional<std::vector<MetricWrite>> MqttCommand::ParseSparkplug(std::string_view payload,
                                                                     std::string& error) {
    if (payload.size() > kMaxSparkplugPayload) {
        error = "payload larger than " + std::to_string(kMaxSparkplugPayload) + " bytes";
        return std::nullopt;
    }
    sparkplug::Payload message;
    if (!message.ParseFromArray(payload.data(), static_cast<int>(payload.size()))) {
        error = "not a Sparkplug B payload";
        return std::nullopt;
    }
    if (static_cast<size_t>(message.metrics_size()) > kMaxMetrics) {
        error = "more than " + std::to_string(kMaxMetrics) + " metrics";
        return std::nullopt;
    }
    std::vector<MetricWrite> writes;
    writes.reserve(static_cast<size_t>(message.metrics_size()));
    for (const auto& metric : message.metrics()) {
        if (!metric.has_name() && !metric.has_alias()) {
            error = "a metric without a name or an alias";
            return std::nullopt;
        }
        MetricWrite& w = writes.emplace_back();
        w.name = metric.name();
        if (metric.has_alias()) w.alias = metric.alias();
        w.value = SparkplugMetric::ValueOf(metric);
    }
    return writes;
}

}  // namespace maroset::gateway
