// Values per second from a driver's report to a subscriber through mosquitto on loopback:
// the gateway as a Sparkplug edge node (batched DDATA), beside a raw libmosquitto publisher
// sending payloads of the same size and shape, in the same run against the same broker.
#include <benchmark/benchmark.h>
#include <mosquitto.h>
#include <stdlib.h>

#include <filesystem>
#include <memory>
#include <string>

#include "core/ScopedRuntime.h"
#include "core/ValueReport.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "gateway/TagDirectory.h"
#include "gateway/mqtt/MqttPublisher.h"
#include "gateway/mqtt/SparkplugMetric.h"
#include "mqtt/MosquittoBroker.h"
#include "mqtt/MqttProbe.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"

namespace {

using namespace maroset;

constexpr int kTags = 1000;          // values per report, one DDATA each
constexpr int kReportsPerBurst = 100;

// One broker for the whole run, in a directory of its own.
test::MosquittoBroker& Broker() {
    static std::filesystem::path dir = [] {
        std::string pattern = (std::filesystem::temp_directory_path() / "maroset-mqtt-XXXXXX").string();
        return std::filesystem::path(mkdtemp(pattern.data()));
    }();
    static test::MosquittoBroker broker(dir);
    static const bool started = broker.start();
    if (!started) throw std::runtime_error("mosquitto did not start");
    return broker;
}

size_t Metrics(const test::MqttProbe& probe) {
    return probe.messages.size() * kTags;
}

void BM_GatewaySparkplugDdata(benchmark::State& state) {
    test::MosquittoBroker& broker = Broker();
    ScopedRuntime scope(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                                  std::make_unique<platform::SystemClock>(),
                                                  std::filesystem::temp_directory_path()));
    Runtime& rt = *scope;
    rt.nodes()->AddNode("Tank", "MEMTAG");
    auto tank = rt.nodes()->getNode("Tank");
    gateway::TagDirectory tags;
    VbArray<int32_t> handles(1, kTags);
    VbArray<Variant> values(1, kTags);
    for (int i = 1; i <= kTags; ++i) {
        tags.add("Tank", i, "T" + std::to_string(i), "Tag" + std::to_string(i));
        handles(i) = i;
        values(i) = Variant(i);
    }
    gateway::MqttOptions options;
    options.setUrl(broker.url());
    options.setSparkplug("Bench/Gateway");
    test::MqttProbe subscriber(broker.port(), "spBv1.0/Bench/DDATA/Gateway/Tank");
    gateway::MqttPublisher publisher(rt, tags, options);
    ReportValues(*tank->driver(), handles, values);  // the birth has every type
    publisher.start();
    while (!subscriber.subscribed() || !publisher.status().connected) {
        rt.loop().runFor(std::chrono::milliseconds(1));
        subscriber.pump();
    }
    rt.loop().runFor(std::chrono::milliseconds(50));
    subscriber.pump();
    subscriber.messages.clear();

    int32_t next = 0;
    for (auto _ : state) {
        for (int r = 0; r < kReportsPerBurst; ++r) {
            for (auto& v : values) v = Variant(++next);
            ReportValues(*tank->driver(), handles, values);
            rt.loop().pump();  // the turn ends: one DDATA
            subscriber.pump();
        }
        while (Metrics(subscriber) < static_cast<size_t>(kReportsPerBurst * kTags)) {
            rt.loop().pump();
            subscriber.pump();
        }
        subscriber.messages.clear();
    }
    state.SetItemsProcessed(state.iterations() * kReportsPerBurst * kTags);
}
BENCHMARK(BM_GatewaySparkplugDdata)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_RawLibmosquittoPublisher(benchmark::State& state) {
    test::MosquittoBroker& broker = Broker();
    sparkplug::Payload payload;
    payload.set_timestamp(1);
    payload.set_seq(1);
    for (int i = 1; i <= kTags; ++i) {
        auto& m = *payload.add_metrics();
        m.set_alias(static_cast<uint64_t>(i));
        m.set_timestamp(1700000000000);
        m.set_int_value(static_cast<uint32_t>(i));
    }
    const std::string topic = "spBv1.0/Bench/DDATA/Raw/Tank";
    test::MqttProbe subscriber(broker.port(), topic);
    while (!subscriber.subscribed()) subscriber.pump();
    mosquitto* raw = mosquitto_new(nullptr, true, nullptr);
    mosquitto_int_option(raw, MOSQ_OPT_TCP_NODELAY, 1);
    if (mosquitto_connect(raw, "127.0.0.1", broker.port(), 30) != MOSQ_ERR_SUCCESS)
        throw std::runtime_error("raw publisher cannot connect");
    mosquitto_loop(raw, 100, 1);  // CONNACK

    int32_t next = 0;
    for (auto _ : state) {
        for (int r = 0; r < kReportsPerBurst; ++r) {
            // The same work a publisher does per message: fill the values, encode, send.
            for (auto& m : *payload.mutable_metrics()) m.set_int_value(static_cast<uint32_t>(++next));
            const std::string bytes = payload.SerializeAsString();
            mosquitto_publish(raw, nullptr, topic.c_str(), static_cast<int>(bytes.size()),
                              bytes.data(), 0, false);
            if (mosquitto_want_write(raw)) mosquitto_loop_write(raw, 1);
            subscriber.pump();
        }
        while (Metrics(subscriber) < static_cast<size_t>(kReportsPerBurst * kTags)) {
            if (mosquitto_want_write(raw)) mosquitto_loop_write(raw, 1);
            subscriber.pump();
        }
        subscriber.messages.clear();
    }
    state.SetItemsProcessed(state.iterations() * kReportsPerBurst * kTags);
    mosquitto_destroy(raw);
}
BENCHMARK(BM_RawLibmosquittoPublisher)->Unit(benchmark::kMillisecond)->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
