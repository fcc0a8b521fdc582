#include "gateway/mqtt/MqttCommand.h"

#include <gtest/gtest.h>

#include <string>

#include "gateway/mqtt/MqttOptions.h"
#include "mqtt/sparkplug_b.pb.h"

namespace maroset::gateway {
namespace {

Variant Set(std::string_view payload) {
    std::string error;
    const auto v = MqttCommand::ParseSet(payload, error);
    EXPECT_TRUE(v) << payload << ": " << error;
    return v.value_or(Variant());
}

std::string Refusal(std::string_view payload) {
    std::string error;
    EXPECT_FALSE(MqttCommand::ParseSet(payload, error)) << payload;
    return error;
}

TEST(SetPayload, AnObjectOrABareValueGivesTheValueOfItsKind) {
    EXPECT_EQ(Set("{\"value\": 42}"), Variant(int32_t{42}));
    EXPECT_EQ(Set(" 42 "), Variant(int32_t{42}));
    EXPECT_EQ(Set("-2147483648"), Variant(int32_t{-2147483647 - 1}));
    EXPECT_EQ(Set("2147483648"), Variant(2147483648.0));  // past a Long: a Double
    EXPECT_EQ(Set("12.5"), Variant(12.5));
    EXPECT_EQ(Set("1e3"), Variant(1000.0));  // an exponent makes a Double
    EXPECT_EQ(Set("true"), Variant(true));
    EXPECT_EQ(Set("{\"time\":\"x\",\"value\":false}"), Variant(false));
    EXPECT_EQ(Set("null"), Variant::Null());
    EXPECT_EQ(Set("\"caf\\u00e9\""), Variant(std::string("caf\xe9")));  // Latin-1 bytes
}

TEST(SetPayload, AnythingElseIsRefusedWithAReason) {
    const auto refused = [](std::string_view payload, std::string_view reason) {
        const std::string error = Refusal(payload);
        EXPECT_EQ(error.substr(0, reason.size()), reason) << payload << ": " << error;
    };
    refused("{\"value\": {\"deep\": 1}}", "a value must be a number, text, true, false or null");
    refused("[1]", "a value must be a number, text, true, false or null");
    refused("{}", "no \"value\" in the object");
    refused("{\"other\": 1}", "no \"value\" in the object");
    refused("", "JSON text ends early");
    refused("1 2", "unexpected text after the value");
    refused("\"\\u20ac\"", "character beyond Latin-1");
    refused(std::string(MqttCommand::kMaxSetPayload + 1, ' '), "payload larger than 4096 bytes");
}

TEST(SparkplugCommand, MetricsByNameOrAliasWithTheirTypedValues) {
    sparkplug::Payload p;
    auto* a = p.add_metrics();
    a->set_name("Level");
    a->set_datatype(sparkplug::Int16);
    a->set_int_value(static_cast<uint32_t>(int32_t{-5}));
    auto* b = p.add_metrics();
    b->set_alias(7);
    b->set_datatype(sparkplug::Int64);
    b->set_long_value(static_cast<uint64_t>(int64_t{-3000000000}));
    auto* c = p.add_metrics();
    c->set_alias(8);
    c->set_datatype(sparkplug::UInt32);
    c->set_int_value(4000000000u);
    auto* d = p.add_metrics();
    d->set_name("Mode");
    d->set_datatype(sparkplug::String);
    d->set_string_value("auto");
    auto* e = p.add_metrics();
    e->set_name("Empty");
    e->set_is_null(true);
    std::string error;
    const auto writes = MqttCommand::ParseSparkplug(p.SerializeAsString(), error);
    ASSERT_TRUE(writes) << error;
    ASSERT_EQ(writes->size(), 5u);
    EXPECT_EQ((*writes)[0].name, "Level");
    EXPECT_FALSE((*writes)[0].alias);
    EXPECT_EQ((*writes)[0].value, Variant(int32_t{-5}));
    EXPECT_EQ((*writes)[1].alias, 7u);
    EXPECT_EQ((*writes)[1].value, Variant(-3000000000.0));
    EXPECT_EQ((*writes)[2].value, Variant(4000000000.0));
    EXPECT_EQ((*writes)[3].value, Variant("auto"));
    EXPECT_EQ((*writes)[4].value, Variant::Null());
}

TEST(SparkplugCommand, BadPayloadsAreRefusedWhole) {
    std::string error;
    EXPECT_FALSE(MqttCommand::ParseSparkplug("\x12\xff\xff\xff\xff\x0f", error));
    EXPECT_EQ(error, "not a Sparkplug B payload");
    sparkplug::Payload nameless;
    nameless.add_metrics()->set_int_value(1);
    EXPECT_FALSE(MqttCommand::ParseSparkplug(nameless.SerializeAsString(), error));
    EXPECT_EQ(error, "a metric without a name or an alias");
    sparkplug::Payload many;
    for (size_t i = 0; i <= MqttCommand::kMaxMetrics; ++i) many.add_metrics()->set_alias(i + 1);
    EXPECT_FALSE(MqttCommand::ParseSparkplug(many.SerializeAsString(), error));
    EXPECT_EQ(error, "more than 1000 metrics");
    EXPECT_FALSE(MqttCommand::ParseSparkplug(std::string(MqttCommand::kMaxSparkplugPayload + 1, 0), error));
}

TEST(MqttOptionsParsing, UrlsIdsAndCombinations) {
    MqttOptions o;
    o.setUrl("mqtt://broker.local");
    EXPECT_EQ(o.endpoint(), "broker.local:1883");
    o.setUrl("mqtts://10.0.0.2:8884/");
    EXPECT_TRUE(o.tls);
    EXPECT_EQ(o.endpoint(), "10.0.0.2:8884");
    EXPECT_THROW(o.validate(), std::invalid_argument);  // mqtts without a CA
    for (const char* bad : {"tcp://x", "mqtt://", "mqtt://x:0", "mqtt://x:65536", "mqtt://x:1a"})
        EXPECT_THROW(o.setUrl(bad), std::invalid_argument) << bad;

    MqttOptions s;
    const auto take = [&](const char* flag, std::string value) {
        return s.take(flag, [&] { return value; });
    };
    EXPECT_THROW(take("--sparkplug", "Plant"), std::invalid_argument);
    EXPECT_THROW(take("--sparkplug", "Plant/Line/1"), std::invalid_argument);
    EXPECT_THROW(take("--sparkplug", "Plant/#"), std::invalid_argument);
    EXPECT_TRUE(take("--sparkplug", "Plant/Line1"));
    EXPECT_EQ(s.group, "Plant");
    EXPECT_EQ(s.edge, "Line1");
    EXPECT_THROW(s.validate(), std::invalid_argument);  // Sparkplug without --mqtt
    EXPECT_TRUE(take("--mqtt", "mqtt://127.0.0.1:1884"));
    EXPECT_NO_THROW(s.validate());
    EXPECT_THROW(take("--mqtt-prefix", "a/b"), std::invalid_argument);
    EXPECT_THROW(take("--mqtt-buffer", "many"), std::invalid_argument);
    EXPECT_TRUE(take("--mqtt-buffer", "10"));
    EXPECT_EQ(s.bufferLimit, 10u);
    EXPECT_FALSE(take("--allow-writes", ""));  // the service's own
    EXPECT_THROW(take("--mqtt-password-file", "/nonexistent/file"), std::invalid_argument);
}

}  // namespace
}  // namespace maroset::gateway
