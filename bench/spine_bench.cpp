// Host write -> node.WriteTag -> memory tag driver -> nodeDB -> façades -> host handlers.
#include <benchmark/benchmark.h>

#include "MemoryTagYardstick.h"

namespace {

using namespace maroset;

void WriteTagRoundTrip(benchmark::State& state) {
    const int64_t received =
        bench::MemoryTagRoundTrips(state, Variant(3.5), static_cast<int>(state.range(0)));
    state.SetItemsProcessed(state.iterations());
    state.counters["host_events"] =
        benchmark::Counter(static_cast<double>(received), benchmark::Counter::kIsRate);
}
BENCHMARK(WriteTagRoundTrip)->Arg(1)->Arg(4);

}  // namespace

BENCHMARK_MAIN();
