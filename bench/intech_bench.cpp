// Intech receive path: characters from the line -> serial port events -> collector -> frame
// check and decode -> the driver's change detection -> nodeDB -> the host's handler.
//
// Counters: chars (characters per second of CPU), replies, values reported, and
// ppm_core_at_9600, the share of one core the receive path takes at 9600 baud (960
// characters a second) in millionths: 960 x the CPU time per character x 1e6.
#include <benchmark/benchmark.h>

#include <time.h>

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "BenchRuntime.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "drivers/intech/FrmNUVIntech.h"
#include "drivers/intech/IntechCollector.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;

std::string withBcc(const std::string& body) {
    unsigned sum = 0;
    for (size_t i = 1; i < body.size(); ++i) sum += static_cast<unsigned char>(body[i]);
    char bcc[3];
    std::snprintf(bcc, sizeof bcc, "%02X", sum & 255);
    return body + bcc + "\r";
}

// Two replies of one kind whose values all differ, so that alternating them reports every
// value each time. Kinds: 0 an extended block (16 values), 1 an analog group (4), 2 the
// digital status (6).
std::vector<std::string> replies(int kind) {
    std::vector<std::string> out;
    for (int variant = 0; variant < 2; ++variant) {
        char buf[16];
        std::string body;
        if (kind == 0) {
            body = "@01EX E2";
            for (int k = 0; k < 16; ++k) {
                std::snprintf(buf, sizeof buf, " %03X", 100 * k + variant + 1);
                body += buf;
            }
        } else if (kind == 1) {
            body = variant ? "@01EX E5 01 42C80000 3F800000 C2C80000 40490FDB"
                           : "@01EX E5 01 42CA0000 3FC00000 C2CA0000 40400000";
        } else {
            body = variant ? "@01EX DI 0003 0015" : "@01EX DI 0000 0000";
        }
        out.push_back(withBcc(body + ":"));
    }
    return out;
}

double threadCpuSeconds() {
    timespec ts{};
    clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
    return double(ts.tv_sec) + double(ts.tv_nsec) * 1e-9;
}

// Args: reply kind, and whether the values change from one reply to the next.
void ReplyToHost(benchmark::State& state) {
    ScopedRuntime scope(bench::VirtualRuntime());
    auto& loop = static_cast<platform::VirtualEventLoop&>(scope->loop());
    platform::MemorySerialCable cable(loop);
    scope->serialDevices().plug("/dev/ttyS0", cable.hostEnd());
    ClsNodeDBInterface host;
    int64_t reported = 0;
    auto sub =
        host.ValueChange.subscribe([&](VbArray<int32_t>&, int16_t n, VbArray<Variant>& values) {
            reported += n;
            benchmark::DoNotOptimize(values(1));
        });
    auto db = host.nodeDB();
    db->AddNode("Meter", "NUVINTECH", "", 1000);
    auto meter = db->getNode("Meter");
    // Every point of one instrument: 86 tags for the driver to match names against.
    int32_t handle = 0;
    for (int p = 1; p <= 16; ++p) meter->AddTag(++handle, "01LAI" + std::to_string(p));
    for (int p = 1; p <= 64; ++p) meter->AddTag(++handle, "01EAI" + std::to_string(p));
    for (int p = 1; p <= 4; ++p) meter->AddTag(++handle, "01LDI" + std::to_string(p));
    for (int p = 1; p <= 2; ++p) meter->AddTag(++handle, "01LDO" + std::to_string(p));
    meter->WriteTag("1", Variant(int16_t{0}));  // opens the port
    cable.takeHostSent();

    const auto frames = replies(static_cast<int>(state.range(0)));
    const bool changing = state.range(1) != 0;
    int64_t chars = 0, n = 0;
    const double cpuBefore = threadCpuSeconds();
    for (auto _ : state) {
        const std::string& frame = frames[changing ? (n & 1) : 0];
        cable.deviceEnd()->write(frame);
        loop.advance(0ms);
        chars += static_cast<int64_t>(frame.size());
        ++n;
    }
    state.counters["chars"] = benchmark::Counter(double(chars), benchmark::Counter::kIsRate);
    state.counters["replies"] = benchmark::Counter(double(n), benchmark::Counter::kIsRate);
    state.counters["values"] = benchmark::Counter(double(reported), benchmark::Counter::kIsRate);
    const double cpu = threadCpuSeconds() - cpuBefore;
    state.counters["ppm_core_at_9600"] = cpu / double(chars) * 960.0 * 1e6;
}
BENCHMARK(ReplyToHost)
    ->ArgNames({"kind", "changing"})
    ->Args({0, 1})
    ->Args({0, 0})
    ->Args({1, 1})
    ->Args({2, 1});

// The collector alone, one character per call.
void Collector(benchmark::State& state) {
    const std::string stream = replies(0)[0] + "noise" + replies(1)[1];
    IntechCollector c;
    int64_t frames = 0;
    for (auto _ : state) {
        for (const char ch : stream) frames += c.feed(std::string_view(&ch, 1));
        c.takeDropped();
    }
    benchmark::DoNotOptimize(frames);
    state.counters["chars"] =
        benchmark::Counter(double(state.iterations() * stream.size()), benchmark::Counter::kIsRate);
}
BENCHMARK(Collector);

}  // namespace

BENCHMARK_MAIN();
