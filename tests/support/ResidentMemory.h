#pragma once

#include <unistd.h>

#include <cstddef>
#include <fstream>

namespace maroset::test {

// Bytes of this process resident in memory now (from /proc/self/statm); 0 when unknown.
inline size_t ResidentBytes() {
    std::ifstream statm("/proc/self/statm");
    size_t pages = 0, resident = 0;
    if (!(statm >> pages >> resident)) return 0;
    return resident * static_cast<size_t>(::sysconf(_SC_PAGESIZE));
}

// How much an endless frame may grow the process.
inline constexpr size_t EndlessFrameGrowthLimit = 1024 * 1024;
// The endless frame fed to every receiver, and the chunks it comes in.
inline constexpr size_t EndlessFrameBytes = 20 * 1024 * 1024;
inline constexpr size_t EndlessFrameChunk = 4096;

}  // namespace maroset::test
