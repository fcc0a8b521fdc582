#pragma once

#include <filesystem>
#include <memory>

#include "core/Runtime.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"

namespace maroset::fuzz {

// A runtime on a virtual loop and its own clock, for harnesses that build it once per process:
// time moves only when they advance it, and no reading of the clock calls into the kernel.
inline std::unique_ptr<Runtime> VirtualRuntime(
    platform::VirtualEventLoop*& loopOut,
    std::filesystem::path driveRoot = std::filesystem::temp_directory_path()) {
    auto loop = std::make_unique<platform::VirtualEventLoop>();
    loopOut = loop.get();
    auto clock = std::make_unique<platform::VirtualClock>(*loop, platform::ZeroDate);
    return std::make_unique<Runtime>(std::move(loop), std::move(clock), std::move(driveRoot));
}

}  // namespace maroset::fuzz
