#pragma once

#include <benchmark/benchmark.h>

#include <cstdint>
#include <memory>
#include <vector>

#include "BenchRuntime.h"
#include "core/ClsNodeDBInterface.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"

namespace maroset::bench {

// The memory tag path, the yardstick other paths are measured against: a host write ->
// node.WriteTag -> memory driver -> nodeDB -> `hosts` façades -> their handlers, on a fresh
// virtual runtime. Runs the benchmark's loop; the number of values the handlers received.
inline int64_t MemoryTagRoundTrips(benchmark::State& state, const Variant& value, int hosts = 1) {
    ScopedRuntime scope(VirtualRuntime());
    std::vector<std::unique_ptr<ClsNodeDBInterface>> facades;
    std::vector<Subscription> subs;
    int64_t received = 0;
    for (int i = 0; i < hosts; ++i) {
        facades.push_back(std::make_unique<ClsNodeDBInterface>());
        subs.push_back(facades.back()->ValueChange.subscribe(
            [&](VbArray<int32_t>& ids, int16_t n, VbArray<Variant>& values) {
                received += n;
                benchmark::DoNotOptimize(ids(1));
                benchmark::DoNotOptimize(values(1));
            }));
    }
    auto db = facades.front()->nodeDB();
    db->AddNode("Line1", "MEMTAG");
    const auto line1 = db->getNode("Line1");
    line1->AddTag(12, "Level");
    for (auto _ : state) line1->WriteTag("12", value);
    return received;
}

}  // namespace maroset::bench
