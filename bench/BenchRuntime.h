#pragma once

#include <filesystem>
#include <memory>

#include "core/Runtime.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"

namespace maroset::bench {

// A runtime on a virtual loop, for the benchmarks that drive time themselves: the loop only
// moves when they advance it, so nothing but the measured work runs. The loop is handed back
// through loopOut when the benchmark needs it.
inline std::unique_ptr<Runtime> VirtualRuntime(
    platform::VirtualEventLoop** loopOut = nullptr,
    std::filesystem::path driveRoot = std::filesystem::temp_directory_path() / "maroset-bench") {
    auto loop = std::make_unique<platform::VirtualEventLoop>();
    if (loopOut) *loopOut = loop.get();
    auto clock = std::make_unique<platform::VirtualClock>(*loop, platform::ZeroDate);
    return std::make_unique<Runtime>(std::move(loop), std::move(clock), std::move(driveRoot));
}

}  // namespace maroset::bench
