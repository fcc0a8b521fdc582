#pragma once

#include "cli/DemoStation.h"

namespace maroset::cli {

// Disk tags (DISKTAG): node "Disk", whose values live in NUVDiskIO/Disk.mdb under the drive
// root. At the start the batch counter is read back from the file (0 in a new file); then it
// counts up once a second, each value stored before it is reported.
class DiskTagStation : public DemoStation {
  public:
    static constexpr int32_t BatchCountHandle = 11;

    std::string title() const override { return "disk tags"; }
    void addNodes(const std::filesystem::path& project) override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
};

}  // namespace maroset::cli
