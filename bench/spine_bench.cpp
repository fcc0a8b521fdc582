// Host write -> node.WriteTag -> memory tag driver -> nodeDB -> façades -> host handlers.
#include <benchmark/benchmark.h>

#include <memory>
#include <vector>

#include "BenchRuntime.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"

namespace {

using namespace maroset;

void WriteTagRoundTrip(benchmark::State& state) {
    ScopedRuntime scope(bench::VirtualRuntime());
    std::vector<std::unique_ptr<ClsNodeDBInterface>> hosts;
    std::vector<Subscription> subs;
    int64_t received = 0;
    for (int i = 0; i < state.range(0); ++i) {
        hosts.push_back(std::make_unique<ClsNodeDBInterface>());
        subs.push_back(hosts.back()->ValueChange.subscribe(
            [&](VbArray<int32_t>& ids, int16_t n, VbArray<Variant>& values) {
                received += n;
                benchmark::DoNotOptimize(ids(1));
                benchmark::DoNotOptimize(values(1));
            }));
    }
    auto db = hosts.front()->nodeDB();
    db->AddNode("Line1", "MEMTAG");
    const auto line1 = db->getNode("Line1");
    line1->AddTag(12, "Level");
    const Variant value(3.5);
    for (auto _ : state) line1->WriteTag("12", value);
    state.SetItemsProcessed(state.iterations());
    state.counters["host_events"] =
        benchmark::Counter(static_cast<double>(received), benchmark::Counter::kIsRate);
}
BENCHMARK(WriteTagRoundTrip)->Arg(1)->Arg(4);

}  // namespace

BENCHMARK_MAIN();
