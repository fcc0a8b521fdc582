#pragma once

#include "cli/DemoStation.h"

namespace maroset::cli {

// Memory tags (MEMTAG): node "Memory" with a set point that ramps every second and a run flag
// that flips every four seconds. The driver reports each write straight back.
class MemoryTagStation : public DemoStation {
  public:
    static constexpr int32_t SetpointHandle = 1;
    static constexpr int32_t RunningHandle = 2;

    std::string title() const override { return "memory tags"; }
    void addNodes(const std::filesystem::path& project) override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
};

}  // namespace maroset::cli
