#pragma once

#include <memory>

#include "cli/DemoStation.h"

namespace maroset::sim {
class IntechSimulator;
}

namespace maroset::cli {

// An Intech instrument (NUVINTECH): node "Meter", polled every 500 ms on port 1, which the
// station maps for this node only to a pseudo-terminal where two instruments of the simulator
// (stations "01" and "02") answer. Analog, extended analog and digital values drift in the
// simulator; every third second the host switches output LDO1, which comes back with the digital
// status.
class IntechStation : public DemoStation {
  public:
    static constexpr int32_t FirstHandle = 31;
    static constexpr int32_t OutputHandle = 35;

    IntechStation();
    ~IntechStation() override;

    std::string title() const override { return "an Intech instrument"; }
    void addNodes(const std::filesystem::path& project) override;
    void startSimulator() override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
    void stopSimulator() override;

  private:
    std::unique_ptr<sim::IntechSimulator> simulator_;
};

}  // namespace maroset::cli
