// A data change of N items from the simulated OPC server up to the host's ValueChange
// (group update -> driver -> nodeDB -> façade -> host), per item; and, to compare with, the
// memory tag path per value (node.WriteTag -> memory tag driver -> nodeDB -> façade -> host).
#include <benchmark/benchmark.h>

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
#include "drivers/opc/ClsDriverOPC.h"
#include "platform/Timer.h"
#include "platform/VirtualEventLoop.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;

// N ramp items on one OPC node; every advance of a second changes all of them, so each
// update is one data change of N items.
void OpcDataChangePerItem(benchmark::State& state) {
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope(bench::VirtualRuntime(&loop));
    ClsNodeDBInterface host;
    int64_t received = 0;
    auto sub =
        host.ValueChange.subscribe([&](VbArray<int32_t>& ids, int16_t n, VbArray<Variant>& values) {
            received += n;
            benchmark::DoNotOptimize(ids(1));
            benchmark::DoNotOptimize(values(1));
        });
    auto n = std::make_shared<node>();
    n->Name = "Opc";
    n->DriverName = Variant("OPC");
    n->ServerName = Variant("Maroset.Simulation");
    n->ScanRate = Variant(1000);
    n->Init();
    auto& driver = dynamic_cast<ClsDriverOPC&>(*n->driver());
    const auto count = static_cast<int32_t>(state.range(0));
    VbArray<std::string> names(1, count);
    VbArray<int32_t> handles(1, count);
    for (int32_t i = 1; i <= count; ++i) {
        names(i) = "Ramp." + std::to_string(i);
        handles(i) = i;
    }
    driver.AddItems(static_cast<int16_t>(count), names, handles);
    n->IsActive(true);
    loop->advance(1000ms);  // the first report after activation
    received = 0;
    for (auto _ : state) loop->advance(1000ms);
    if (received != static_cast<int64_t>(state.iterations()) * count)
        state.SkipWithError("not every item was reported");
    state.SetItemsProcessed(received);
    state.counters["ns_per_item"] = benchmark::Counter(
        static_cast<double>(received), benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(OpcDataChangePerItem)->Arg(1)->Arg(100)->Arg(10000)->Unit(benchmark::kMicrosecond);

// What the loop itself costs for one timer tick with nothing to do: the floor under a data
// change of a single item.
void LoopTimerTickAlone(benchmark::State& state) {
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope(bench::VirtualRuntime(&loop));
    platform::Timer timer(*loop);
    int64_t ticks = 0;
    auto sub = timer.Tick.subscribe([&] { ++ticks; });
    timer.Interval(1000);
    timer.Enabled(true);
    for (auto _ : state) loop->advance(1000ms);
    state.SetItemsProcessed(ticks);
}
BENCHMARK(LoopTimerTickAlone);

// The memory tag path, one value per report, as bench/spine_bench.cpp measures it.
void MemoryTagPerValue(benchmark::State& state) {
    const int64_t received = bench::MemoryTagRoundTrips(state, Variant(int32_t{35}));
    state.SetItemsProcessed(received);
    state.counters["ns_per_item"] = benchmark::Counter(
        static_cast<double>(received), benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}
BENCHMARK(MemoryTagPerValue);

}  // namespace

BENCHMARK_MAIN();
