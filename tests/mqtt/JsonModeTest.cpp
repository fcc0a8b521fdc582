#include "gateway/mqtt/JsonSession.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "GatewayFixture.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "gateway/EventStream.h"
#include "gateway/ServeApi.h"
#include "gateway/TagBook.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;

class JsonMode : public test::GatewayFixture {
  protected:
    // A memory-tag node "Tank" with tags Level (1) and Mode (2).
    std::shared_ptr<node> tank() {
        runtime().nodes()->AddNode("Tank", "MEMTAG");
        tags_.add("Tank", 1, "Level", "Level");
        tags_.add("Tank", 2, "Mode", "Mode");
        return runtime().nodes()->getNode("Tank");
    }
    std::string valueOf(const std::string& payload) {
        const size_t at = payload.find("\"value\":");
        return at == std::string::npos ? "" : payload.substr(at + 8, payload.find(",\"time\"") - at - 8);
    }
    std::vector<std::string> values(const test::MqttProbe& p, const std::string& topic) {
        std::vector<std::string> out;
        for (const auto& m : p.on(topic)) out.push_back(valueOf(m.payload));
        return out;
    }
};

TEST_F(JsonMode, ValuesStateAndLinkAreRetainedForLateSubscribers) {
    auto t = tank();
    startPublisher(options());
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    t->WriteTag("1", Variant(int32_t{42}));
    t->WriteTag("2", Variant("auto"));
    t->WriteTag("1", Variant(12.5));
    settle();

    auto& late = probe("maroset/#");
    ASSERT_TRUE(runUntil([&] { return late.messages.size() >= 4; }));
    settle();
    const auto level = late.on("maroset/Tank/Level");
    ASSERT_EQ(level.size(), 1u);  // only the latest is retained
    EXPECT_TRUE(level[0].retained);
    EXPECT_EQ(valueOf(level[0].payload), "12.5");
    EXPECT_NE(level[0].payload.find("\"time\":\"20"), std::string::npos) << level[0].payload;
    EXPECT_EQ(values(late, "maroset/Tank/Mode"), std::vector<std::string>{"\"auto\""});
    ASSERT_EQ(late.on("maroset/$state").size(), 1u);
    EXPECT_EQ(late.on("maroset/$state")[0].payload, "online");
    ASSERT_EQ(late.on("maroset/Tank/$link").size(), 1u);
    EXPECT_NE(late.on("maroset/Tank/$link")[0].payload.find("\"state\":\"local\""), std::string::npos);

    // A service that dies leaves "offline" behind.
    publisher_.reset();
    ASSERT_TRUE(runUntil([&] { return late.on("maroset/$state").size() == 2; }));
    EXPECT_EQ(late.on("maroset/$state")[1].payload, "offline");
}

TEST_F(JsonMode, TheLinkTopicFollowsADeviceThatStopsAndReturns) {
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {100, 0});
    auto& watcher = probe("maroset/PLC1/#");
    startPublisher(options());
    auto p = plc(*sim);
    const auto lastState = [&] {
        const auto links = watcher.on("maroset/PLC1/$link");
        if (links.empty()) return std::string();
        const std::string& payload = links.back().payload;
        const size_t at = payload.find("\"state\":\"") + 9;
        return payload.substr(at, payload.find('"', at) - at);
    };
    ASSERT_TRUE(runUntil([&] { return lastState() == "up"; }));
    ASSERT_TRUE(runUntil([&] { return !watcher.on("maroset/PLC1/TankLevel").empty(); }));
    sim->stopListening();  // every connection closed
    sim->startListening();
    ASSERT_TRUE(runUntil([&] { return lastState() == "down"; }));
    runtime().nodes()->StartScanning();  // the soft-PLC driver reconnects on activation
    ASSERT_TRUE(runUntil([&] { return lastState() == "up"; }));
}

TEST_F(JsonMode, SetWritesReachTheDeviceOnlyWhenAllowed) {
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {0, 0});
    auto p = plc(*sim);
    ASSERT_TRUE(runUntil([&] { return sim->clients() == 1; }));

    auto& client = probe("maroset/$errors");
    gateway::MqttOptions refusing = options();
    startPublisher(refusing);
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    client.publish("maroset/PLC1/TankLevel/set", "{\"value\": 7}");
    ASSERT_TRUE(runUntil([&] { return client.messages.size() == 1; }));
    EXPECT_NE(client.messages[0].payload.find("--allow-writes"), std::string::npos);
    EXPECT_NE(client.messages[0].payload.find("\"topic\":\"maroset/PLC1/TankLevel/set\""),
              std::string::npos);
    EXPECT_FALSE(client.messages[0].retained);

    gateway::MqttOptions allowing = options();
    allowing.allowWrites = true;
    startPublisher(allowing);
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    client.publish("maroset/PLC1/TankLevel/set", "{\"value\": \"hello\"}");
    ASSERT_TRUE(runUntil([&] { return sim->tag(41) && sim->tag(41)->value == "hello"; }));
    client.publish("maroset/PLC1/TankLevel/set", "2.5");  // a bare value is a write too
    ASSERT_TRUE(runUntil([&] { return sim->tag(41)->value == "2.5"; }));

    client.publish("maroset/PLC1/Nothing/set", "1");
    client.publish("maroset/PLC1/TankLevel/set", "{\"value\": [1, 2]}");
    client.publish("maroset/PLC1/TankLevel/set", std::string(5000, '1'));
    ASSERT_TRUE(runUntil([&] { return client.messages.size() == 4; }));
    EXPECT_NE(client.messages[1].payload.find("no such tag"), std::string::npos);
    EXPECT_NE(client.messages[2].payload.find("a value must be"), std::string::npos);
    EXPECT_NE(client.messages[3].payload.find("larger than"), std::string::npos);
    EXPECT_EQ(sim->tag(41)->value, "2.5");
}

TEST_F(JsonMode, APasswordBrokerTakesTheRightPasswordOnly) {
    test::TempDir other;
    test::MosquittoBroker guarded(other.path(), "gateway", "s3cret");
    ASSERT_TRUE(guarded.start());
    gateway::MqttOptions wrong;
    wrong.setUrl(guarded.url());
    wrong.user = "gateway";
    wrong.password = "guess";
    startPublisher(wrong);
    settle(1500ms);
    EXPECT_FALSE(publisher_->status().connected);
    EXPECT_EQ(publisher_->status().state, "waiting");

    gateway::MqttOptions right = wrong;
    right.password = "s3cret";
    startPublisher(right);
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
}

// The broker dies while the values keep changing; nothing within the buffer is lost and the
// order holds once it is back.
TEST_F(JsonMode, ChangesWhileTheBrokerIsAwayArriveInOrderAfterward) {
    auto t = tank();
    startPublisher(options());
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    t->WriteTag("2", Variant("manual"));

    broker_.kill();
    ASSERT_TRUE(runUntil([&] { return !publisher_->status().connected; }));
    for (int32_t i = 1; i <= 500; ++i) t->WriteTag("1", Variant(i));
    EXPECT_EQ(publisher_->status().buffered, 500u);

    ASSERT_TRUE(broker_.start());  // an empty broker: the retained values went with it
    auto& watcher = probe("maroset/Tank/#");
    ASSERT_TRUE(runUntil([&] { return watcher.on("maroset/Tank/Level").size() == 500; }, 15s));
    std::vector<std::string> expected;
    for (int i = 1; i <= 500; ++i) expected.push_back(std::to_string(i));
    EXPECT_EQ(values(watcher, "maroset/Tank/Level"), expected);
    // The unchanged tag is retained again too.
    ASSERT_TRUE(runUntil([&] { return !watcher.on("maroset/Tank/Mode").empty(); }));
    EXPECT_EQ(values(watcher, "maroset/Tank/Mode"), std::vector<std::string>{"\"manual\""});
    EXPECT_EQ(publisher_->status().buffered, 0u);
    EXPECT_EQ(publisher_->status().reconnects, 1u);
}

TEST_F(JsonMode, PastTheBufferTheOldestChangesAreDroppedAndCounted) {
    auto t = tank();
    gateway::MqttOptions small = options();
    small.bufferLimit = 10;
    startPublisher(small);
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    std::vector<std::string> trace;
    auto reading = runtime().incidents().subscribe([&](const platform::LinkIncident& i) {
        if (i.node() == "$mqtt") trace.push_back(i.text());
    });

    broker_.kill();
    ASSERT_TRUE(runUntil([&] { return !publisher_->status().connected; }));
    for (int32_t i = 1; i <= 50; ++i) t->WriteTag("1", Variant(i));
    EXPECT_EQ(publisher_->status().buffered, 10u);
    EXPECT_EQ(publisher_->status().dropped, 40u);

    ASSERT_TRUE(broker_.start());
    auto& watcher = probe("maroset/Tank/Level");
    ASSERT_TRUE(runUntil([&] { return watcher.messages.size() == 10; }, 15s));
    settle();
    std::vector<std::string> expected;
    for (int i = 41; i <= 50; ++i) expected.push_back(std::to_string(i));
    EXPECT_EQ(values(watcher, "maroset/Tank/Level"), expected);
    const auto told = [&](const std::string& words) {
        return std::any_of(trace.begin(), trace.end(),
                           [&](const std::string& l) { return l.find(words) != std::string::npos; });
    };
    EXPECT_TRUE(told("the oldest are dropped"));
    EXPECT_TRUE(told("40 changes dropped"));
}

TEST_F(JsonMode, TheNodeListAndTheMetricsShowTheMqttSide) {
    auto t = tank();
    startPublisher(options());
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    t->WriteTag("1", Variant(int32_t{1}));
    gateway::TagBook book(runtime().reports(), runtime().clock(), {});
    gateway::EventStream events(loop(), runtime().reports(), runtime().linkStatus(), runtime().clock());
    gateway::ServeApi api(*runtime().nodes(), runtime().linkStatus(), book, events, {});
    api.attach(*publisher_);
    const std::string nodes = api.handle({"GET", "/api/nodes", "", ""}).body;
    EXPECT_NE(nodes.find("{\"name\":\"$mqtt\",\"driver\":\"MQTT\",\"endpoint\":\"127.0.0.1:" +
                         std::to_string(broker_.port()) + "\",\"link\":{\"state\":\"connected\","
                         "\"connected\":true,\"messagesOut\":"),
              std::string::npos)
        << nodes;
    const std::string metrics = api.handle({"GET", "/metrics", "", ""}).body;
    EXPECT_NE(metrics.find("\nmaroset_mqtt_connected 1\n"), std::string::npos) << metrics;
    EXPECT_NE(metrics.find("\nmaroset_mqtt_reconnects_total 0\n"), std::string::npos);
    EXPECT_EQ(metrics.find("maroset_mqtt_messages_out_total 0\n"), std::string::npos);
}

}  // namespace
}  // namespace maroset
