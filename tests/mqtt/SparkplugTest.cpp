#include "gateway/mqtt/SparkplugEdgeNode.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "GatewayFixture.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "mqtt/sparkplug_b.pb.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using sparkplug::Payload;

class Sparkplug : public test::GatewayFixture {
  protected:
    void SetUp() override {
        GatewayFixture::SetUp();
        runtime().nodes()->AddNode("Tank", "MEMTAG");
        tags_.add("Tank", 1, "Level", "Level");
        tags_.add("Tank", 2, "Mode", "Mode");
        tank_ = runtime().nodes()->getNode("Tank");
    }
    gateway::MqttOptions edge(bool writes = false) {
        gateway::MqttOptions o = options();
        o.setSparkplug("Plant/Line1");
        o.allowWrites = writes;
        return o;
    }
    static Payload decode(const test::MqttProbe::Message& m) {
        Payload p;
        EXPECT_TRUE(p.ParseFromString(m.payload)) << m.topic;
        return p;
    }
    // "NBIRTH", "DDATA/Tank", ... for each message of the edge node, in order.
    static std::vector<std::string> kinds(const test::MqttProbe& p) {
        std::vector<std::string> out;
        const std::string prefix = "spBv1.0/Plant/";
        for (const auto& m : p.messages) {
            std::string rest = m.topic.substr(prefix.size());
            const size_t edge = rest.find("/Line1");
            out.push_back(rest.substr(0, edge) + rest.substr(edge + 6));
        }
        return out;
    }
    static const Payload::Metric* metric(const Payload& p, const std::string& name) {
        for (const auto& m : p.metrics())
            if (m.name() == name) return &m;
        return nullptr;
    }
    static void expectSeqRuns(const test::MqttProbe& p) {
        // From each NBIRTH on, seq counts 0, 1, ... 255, 0 over every message but the deaths.
        int expected = -1;
        for (const auto& m : p.messages) {
            if (m.topic.find("/NDEATH/") != std::string::npos) continue;
            const Payload payload = decode(m);
            if (m.topic.find("/NBIRTH/") != std::string::npos) expected = 0;
            ASSERT_TRUE(payload.has_seq()) << m.topic;
            EXPECT_EQ(payload.seq(), static_cast<uint64_t>(expected)) << m.topic;
            expected = (expected + 1) % 256;
        }
    }
    std::shared_ptr<node> tank_;
};

TEST_F(Sparkplug, BirthsComeFirstThenDataByAliasBatchedPerTurnWithSeqWrapping) {
    auto& host = probe("spBv1.0/#");
    publisher_ = std::make_unique<gateway::MqttPublisher>(runtime(), tags_, edge());
    tank_->WriteTag("1", Variant(int32_t{5}));  // before the broker: kept, then history
    tank_->WriteTag("2", Variant("auto"));
    publisher_->start();
    ASSERT_TRUE(runUntil([&] { return host.messages.size() == 3; }));
    EXPECT_EQ(kinds(host), (std::vector<std::string>{"NBIRTH", "DBIRTH/Tank", "DDATA/Tank"}));
    EXPECT_TRUE(decode(host.messages[2]).metrics(0).is_historical());

    const Payload nbirth = decode(host.messages[0]);
    ASSERT_NE(metric(nbirth, "bdSeq"), nullptr);
    EXPECT_EQ(metric(nbirth, "bdSeq")->datatype(), sparkplug::Int64);
    ASSERT_NE(metric(nbirth, "Node Control/Rebirth"), nullptr);
    EXPECT_FALSE(metric(nbirth, "Node Control/Rebirth")->boolean_value());
    const Payload dbirth = decode(host.messages[1]);
    ASSERT_EQ(dbirth.metrics_size(), 2);
    const auto* level = metric(dbirth, "Level");
    ASSERT_NE(level, nullptr);
    EXPECT_EQ(level->datatype(), sparkplug::Int32);
    EXPECT_EQ(level->int_value(), 5u);
    const auto* mode = metric(dbirth, "Mode");
    EXPECT_EQ(mode->datatype(), sparkplug::String);
    EXPECT_EQ(mode->string_value(), "auto");
    EXPECT_NE(level->alias(), mode->alias());

    // Three changes in one turn travel as one DDATA, by alias only, in order.
    tank_->WriteTag("1", Variant(int32_t{6}));
    tank_->WriteTag("1", Variant(int32_t{-7}));
    tank_->WriteTag("2", Variant("manual"));
    ASSERT_TRUE(runUntil([&] { return host.messages.size() == 4; }));
    const Payload ddata = decode(host.messages[3]);
    ASSERT_EQ(ddata.metrics_size(), 3);
    for (const auto& m : ddata.metrics()) {
        EXPECT_FALSE(m.has_name());
        EXPECT_FALSE(m.is_historical());
    }
    EXPECT_EQ(ddata.metrics(0).alias(), level->alias());
    EXPECT_EQ(static_cast<int32_t>(ddata.metrics(1).int_value()), -7);
    EXPECT_EQ(ddata.metrics(2).string_value(), "manual");

    // A turn each: seq wraps after 255.
    for (int32_t i = 0; i < 300; ++i) {
        tank_->WriteTag("1", Variant(i));
        loop().pump();
    }
    ASSERT_TRUE(runUntil([&] { return host.messages.size() == 304; }));
    expectSeqRuns(host);
}

TEST_F(Sparkplug, TheWillIsAnNdeathWithTheBirthsBdSeq) {
    auto& host = probe("spBv1.0/#");
    startPublisher(edge());
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/NBIRTH/Line1").size() == 1; }));
    // A reconnect is a new session with the next bdSeq.
    broker_.kill();
    ASSERT_TRUE(runUntil([&] { return !publisher_->status().connected; }));
    ASSERT_TRUE(broker_.start());
    auto& again = probe("spBv1.0/#");
    ASSERT_TRUE(runUntil([&] { return again.on("spBv1.0/Plant/NBIRTH/Line1").size() == 1; }));
    const uint64_t first = metric(decode(host.on("spBv1.0/Plant/NBIRTH/Line1")[0]), "bdSeq")->long_value();
    const uint64_t second = metric(decode(again.on("spBv1.0/Plant/NBIRTH/Line1")[0]), "bdSeq")->long_value();
    EXPECT_NE(first, second);

    publisher_.reset();  // the service dies without a word
    ASSERT_TRUE(runUntil([&] { return again.on("spBv1.0/Plant/NDEATH/Line1").size() == 1; }));
    const Payload death = decode(again.on("spBv1.0/Plant/NDEATH/Line1")[0]);
    ASSERT_NE(metric(death, "bdSeq"), nullptr);
    EXPECT_EQ(metric(death, "bdSeq")->long_value(), second);
}

TEST_F(Sparkplug, ADeviceDiesWhenItsSimulatorStopsAndIsBornAgainWhenItReturns) {
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {100, 0});
    auto p = plc(*sim);
    auto& host = probe("spBv1.0/#");
    startPublisher(edge());
    ASSERT_TRUE(runUntil([&] { return !host.on("spBv1.0/Plant/DDATA/Line1/PLC1").empty(); }));
    const auto births = host.on("spBv1.0/Plant/DBIRTH/Line1/PLC1");
    ASSERT_GE(births.size(), 1u);
    EXPECT_EQ(decode(births.back()).metrics(0).name(), "TankLevel");

    sim->stopListening();  // every connection closed
    sim->startListening();
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/DDEATH/Line1/PLC1").size() == 1; }));
    const size_t died = host.messages.size();
    settle();
    for (size_t i = died; i < host.messages.size(); ++i)
        EXPECT_EQ(host.messages[i].topic.find("/PLC1"), std::string::npos) << "nothing after its death";

    runtime().nodes()->StartScanning();  // the soft-PLC driver reconnects on activation
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/DBIRTH/Line1/PLC1").size() > births.size(); }));
    // The memory node never had a link to lose.
    EXPECT_TRUE(host.on("spBv1.0/Plant/DDEATH/Line1/Tank").empty());
    expectSeqRuns(host);
}

TEST_F(Sparkplug, NcmdRebirthRepublishesEveryBirth) {
    auto& host = probe("spBv1.0/#");
    startPublisher(edge());
    ASSERT_TRUE(runUntil([&] { return host.messages.size() == 2; }));
    Payload cmd;
    auto& m = *cmd.add_metrics();
    m.set_name("Node Control/Rebirth");
    m.set_datatype(sparkplug::Boolean);
    m.set_boolean_value(true);
    host.publish("spBv1.0/Plant/NCMD/Line1", cmd.SerializeAsString());
    ASSERT_TRUE(runUntil([&] { return host.messages.size() == 5; }));
    EXPECT_EQ(kinds(host), (std::vector<std::string>{"NBIRTH", "DBIRTH/Tank", "NCMD",
                                                     "NBIRTH", "DBIRTH/Tank"}));
    EXPECT_EQ(decode(host.messages[3]).seq(), 0u);
}

TEST_F(Sparkplug, DcmdWritesByAliasOrNameOnlyWhenAllowed) {
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {0, 0});
    auto p = plc(*sim);
    auto& host = probe("spBv1.0/Plant/DBIRTH/#");
    startPublisher(edge());
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/DBIRTH/Line1/PLC1").size() == 1; }));
    const uint64_t alias = decode(host.on("spBv1.0/Plant/DBIRTH/Line1/PLC1")[0]).metrics(0).alias();
    const auto dcmd = [&](bool byAlias, const std::string& text) {
        Payload cmd;
        auto& m = *cmd.add_metrics();
        if (byAlias) m.set_alias(alias);
        else m.set_name("TankLevel");
        m.set_datatype(sparkplug::String);
        m.set_string_value(text);
        host.publish("spBv1.0/Plant/DCMD/Line1/PLC1", cmd.SerializeAsString());
    };
    dcmd(true, "refused");
    settle();
    EXPECT_NE(sim->tag(41) ? sim->tag(41)->value : "", "refused");

    startPublisher(edge(true));
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/DBIRTH/Line1/PLC1").size() == 2; }));
    dcmd(true, "by alias");
    ASSERT_TRUE(runUntil([&] { return sim->tag(41) && sim->tag(41)->value == "by alias"; }));
    dcmd(false, "by name");
    ASSERT_TRUE(runUntil([&] { return sim->tag(41)->value == "by name"; }));
    host.publish("spBv1.0/Plant/DCMD/Line1/PLC1", "not protobuf at all");
    host.publish("spBv1.0/Plant/DCMD/Line1/Nobody", "");
    settle();
    EXPECT_EQ(sim->tag(41)->value, "by name");
}

TEST_F(Sparkplug, ChangesWhileTheBrokerIsAwayFollowTheRebirthAsHistory) {
    startPublisher(edge());
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    broker_.kill();
    ASSERT_TRUE(runUntil([&] { return !publisher_->status().connected; }));
    for (int32_t i = 1; i <= 3000; ++i) tank_->WriteTag("1", Variant(i));

    ASSERT_TRUE(broker_.start());
    auto& host = probe("spBv1.0/#");
    ASSERT_TRUE(runUntil([&] {
        int n = 0;
        for (const auto& m : host.on("spBv1.0/Plant/DDATA/Line1/Tank")) n += decode(m).metrics_size();
        return n == 3000;
    }, 15s));
    const auto k = kinds(host);
    ASSERT_GE(k.size(), 3u);
    EXPECT_EQ(k[0], "NBIRTH");
    EXPECT_EQ(k[1], "DBIRTH/Tank");
    EXPECT_EQ(metric(decode(host.messages[1]), "Level")->int_value(), 3000u);  // the latest
    int32_t expected = 1;
    for (const auto& m : host.on("spBv1.0/Plant/DDATA/Line1/Tank")) {
        const Payload ddata = decode(m);
        for (const auto& metric : ddata.metrics()) {
            EXPECT_TRUE(metric.is_historical());
            EXPECT_EQ(static_cast<int32_t>(metric.int_value()), expected++);
        }
    }
    expectSeqRuns(host);
}

TEST_F(Sparkplug, WithAPrimaryHostBirthsWaitUntilItIsOnline) {
    auto& host = probe("spBv1.0/#");
    gateway::MqttOptions o = edge();
    o.primaryHost = "Scada";
    startPublisher(o);
    ASSERT_TRUE(runUntil([&] { return publisher_->status().connected; }));
    settle();
    EXPECT_TRUE(host.on("spBv1.0/Plant/NBIRTH/Line1").empty());
    tank_->WriteTag("1", Variant(int32_t{9}));
    host.publish("spBv1.0/STATE/Scada", "{\"online\":true,\"timestamp\":1}", true);
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/DBIRTH/Line1/Tank").size() == 1; }));
    EXPECT_EQ(metric(decode(host.on("spBv1.0/Plant/DBIRTH/Line1/Tank")[0]), "Level")->int_value(), 9u);

    host.publish("spBv1.0/STATE/Scada", "{\"online\":false,\"timestamp\":2}", true);
    ASSERT_TRUE(runUntil([&] { return host.on("spBv1.0/Plant/NDEATH/Line1").size() == 1; }));
    settle(1500ms);
    EXPECT_EQ(host.on("spBv1.0/Plant/NBIRTH/Line1").size(), 1u) << "no birth while the host is away";
}

}  // namespace
}  // namespace maroset
