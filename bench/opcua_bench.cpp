// The OPC UA client's hot path.
// - UaNotificationDecodePerValue: one PublishResponse holding N data changes of Doubles,
//   decoded down to each value as the client hands it to the item cache; per value.
// - MemoryTagPerValue: the memory tag path per value (node.WriteTag -> memory tag driver ->
//   nodeDB -> façade -> host), the yardstick for the decode.
// - UaServerToValueChange: values per second from a real OPC UA server (node-opcua,
//   tests/opcua/server) to the host's ValueChange, and this process's processor time per
//   value; node-opcua's own client subscribed to the same items at the same time reports
//   its processor time per value (node_cpu_us_per_value) beside ours (cpu_us_per_value).
#include <benchmark/benchmark.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "BenchRuntime.h"
#include "MemoryTagYardstick.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "platform/opc/OpcItemSource.h"
#include "platform/opcua/UaCodec.h"
#include "platform/opcua/UaServices.h"

namespace {

using namespace maroset;
using namespace maroset::platform::opcua;
using namespace std::chrono_literals;

// A PublishResponse body (after its type id) with one DataChangeNotification of n Doubles.
std::string publishResponse(uint32_t n) {
    std::string notification;
    Writer d(notification);
    d.i32(static_cast<int32_t>(n));
    for (uint32_t k = 0; k < n; ++k) {
        d.u32(k + 1);  // client handle
        d.u8(0x05);    // value and source time stamp
        d.u8(static_cast<uint8_t>(BuiltIn::Double));
        d.f64(k * 0.5);
        d.i64(133486382450000000LL);
    }
    d.i32(-1);
    std::string body;
    Writer w(body);
    w.i64(0);
    w.u32(1);
    w.u32(0);
    w.u8(0);
    w.i32(-1);
    w.nodeId(NodeId{});
    w.u8(0);   // response header done
    w.u32(1);  // subscription id
    w.i32(1);
    w.u32(7);  // available sequence numbers
    w.u8(0);   // more notifications
    w.u32(7);  // sequence number
    w.i64(0);
    w.i32(1);
    w.nodeId(NodeId::Numeric(id::DataChangeNotification));
    w.u8(1);
    w.bytes(notification);
    w.i32(-1);
    w.i32(-1);
    return body;
}

void UaNotificationDecodePerValue(benchmark::State& state) {
    const auto n = static_cast<uint32_t>(state.range(0));
    const std::string body = publishResponse(n);
    std::vector<Value> response, items;
    std::vector<platform::OpcItemState> cache(n + 1);
    for (auto _ : state) {
        Reader r(body);
        Decode(r, msg::PublishResponse, response);
        // subscription, 1 available sequence number, more, sequence, publish time, count, then the
        // notification.
        const Value& eo = response.at(AfterHeader(response) + 7);
        Reader nr(eo.text);
        Decode(nr, msg::DataChangeNotification, items);
        for (uint32_t k = 0; k < items[0].count; ++k) {
            auto& slot = cache[items[1 + 2 * k].number];
            slot.value = std::move(items[2 + 2 * k].data.value);
            slot.quality = 192;
        }
        benchmark::DoNotOptimize(cache.data());
    }
    state.SetItemsProcessed(static_cast<int64_t>(state.iterations()) * n);
    state.counters["ns_per_value"] =
        benchmark::Counter(static_cast<double>(state.iterations()) * n,
                           benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(UaNotificationDecodePerValue)->Arg(1)->Arg(100)->Arg(1000);

void MemoryTagPerValue(benchmark::State& state) {
    bench::MemoryTagRoundTrips(state, Variant(3.5));
    state.SetItemsProcessed(state.iterations());
    state.counters["ns_per_value"] =
        benchmark::Counter(static_cast<double>(state.iterations()),
                           benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(MemoryTagPerValue);

double cpuSeconds() {
    rusage u{};
    getrusage(RUSAGE_SELF, &u);
    return static_cast<double>(u.ru_utime.tv_sec + u.ru_stime.tv_sec) +
           static_cast<double>(u.ru_utime.tv_usec + u.ru_stime.tv_usec) / 1e6;
}

const std::filesystem::path ServerDir =
    std::filesystem::path(MAROSET_SOURCE_DIR) / "tests/opcua/server";

// The node-opcua server, its commands through a named pipe.
class Peer {
  public:
    Peer() {
        fifo_ = std::filesystem::temp_directory_path() /
                ("maroset-ua-bench-" + std::to_string(getpid()));
        mkfifo(fifo_.c_str(), 0600);
        const std::string cmd = "cd '" + ServerDir.string() + "' && exec node server.js 0 < '" +
                                fifo_.string() + "' 2>/dev/null";
        out_ = popen(cmd.c_str(), "r");
        in_ = std::fopen(fifo_.c_str(), "w");
        char line[256];
        while (out_ && std::fgets(line, sizeof line, out_)) {
            const std::string l(line);
            if (l.rfind("ENDPOINT ", 0) == 0) {
                endpoint_ = l.substr(9, l.find_last_not_of("\r\n") - 8);
                break;
            }
        }
    }
    ~Peer() {
        if (in_) {
            command("quit");
            std::fclose(in_);
        }
        if (out_) pclose(out_);
        std::filesystem::remove(fifo_);
    }
    const std::string& endpoint() const { return endpoint_; }
    void command(const std::string& text) {
        std::fputs((text + "\n").c_str(), in_);
        std::fflush(in_);
    }

  private:
    std::filesystem::path fifo_;
    FILE* out_ = nullptr;
    FILE* in_ = nullptr;
    std::string endpoint_;
};

void UaServerToValueChange(benchmark::State& state) {
    if (!std::filesystem::exists(ServerDir / "node_modules/node-opcua")) {
        state.SkipWithError("node-opcua is not installed (./run bench does npm ci)");
        return;
    }
    const auto items = static_cast<int32_t>(state.range(0));
    constexpr int rate = 100;
    constexpr auto window = 5000ms;
    Peer peer;
    if (peer.endpoint().empty()) {
        state.SkipWithError("the OPC UA test server did not start");
        return;
    }
    peer.command("bench " + std::to_string(items) + " " + std::to_string(rate));
    ScopedRuntime scope(std::make_unique<Runtime>());
    auto& loop = Runtime::current().loop();
    ClsNodeDBInterface host;
    int64_t received = 0;
    auto sub =
        host.ValueChange.subscribe([&](VbArray<int32_t>&, int16_t n, VbArray<Variant>& values) {
            received += n;
            benchmark::DoNotOptimize(values(1));
        });
    auto n = std::make_shared<node>();
    n->Name = "Ua";
    n->DriverName = Variant("OPC");
    n->ServerName = Variant(peer.endpoint());
    n->TagPrefex = Variant("nsu=urn:maroset:test;s=");
    n->ScanRate = Variant(rate);
    n->Init();
    loop.runFor(1000ms);  // the bench items are made
    for (int32_t i = 0; i < items; ++i) n->AddTag(i + 1, "Bench." + std::to_string(i));
    n->IsActive(true);
    loop.runFor(1000ms);  // the first full report
    for (auto _ : state) {
        // node-opcua's client on the same items, over the same window.
        const std::string cmd = "cd '" + ServerDir.string() + "' && node client_bench.js " +
                                peer.endpoint() + " " + std::to_string(items) + " " +
                                std::to_string(rate) + " " + std::to_string(window.count());
        FILE* other = popen(cmd.c_str(), "r");
        loop.runFor(2500ms);  // the other client connects and skips its first second
        received = 0;
        const double cpu0 = cpuSeconds();
        const auto t0 = std::chrono::steady_clock::now();
        loop.runFor(window);
        const double cpu = cpuSeconds() - cpu0;
        const double seconds =
            std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
        char line[256] = {};
        while (other && std::fgets(line, sizeof line, other)) {
            if (line[0] == '{') break;
        }
        if (other) pclose(other);
        double nodeValues = 0, nodeCpuUs = 0;
        std::sscanf(line, "{\"values\":%lf,\"cpuUs\":%lf}", &nodeValues, &nodeCpuUs);
        state.counters["values_per_s"] = static_cast<double>(received) / seconds;
        state.counters["cpu_us_per_value"] =
            received ? cpu * 1e6 / static_cast<double>(received) : 0;
        state.counters["node_values_per_s"] =
            nodeValues / (static_cast<double>(window.count()) / 1000);
        state.counters["node_cpu_us_per_value"] = nodeValues ? nodeCpuUs / nodeValues : 0;
    }
    n->IsActive(false);
    n.reset();
}
BENCHMARK(UaServerToValueChange)->Arg(200)->Arg(1000)->Iterations(1)->Unit(benchmark::kSecond);

}  // namespace

BENCHMARK_MAIN();
