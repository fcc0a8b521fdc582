#pragma once

#include <memory>

#include "cli/DemoStation.h"

namespace maroset::sim {
class WagoCouplerSimulator;
}

namespace maroset::cli {

// A WAGO coupler (WAGOIO): node "Coupler" at 127.0.0.1, scanned every 500 ms, against the
// coupler simulator on a free loopback port (the runtime's Modbus port is pointed at it). The
// inputs move by themselves (a count, a signed swing, a bit of the count); the demo writes the
// output word every two seconds and flips the output bit every three, and both come back
// through the coupler's read-back area.
class WagoStation : public DemoStation {
  public:
    static constexpr int32_t CountHandle = 51;       // IW0
    static constexpr int32_t SwingHandle = 52;       // IW1
    static constexpr int32_t InputBitHandle = 53;    // ID0.1
    static constexpr int32_t OutputWordHandle = 54;  // OW0
    static constexpr int32_t OutputBitHandle = 55;   // OD0.3

    WagoStation();
    ~WagoStation() override;

    std::string title() const override { return "a WAGO coupler"; }
    void addNodes(const std::filesystem::path& project) override;
    void startSimulator() override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
    void stopSimulator() override;

  private:
    std::unique_ptr<sim::WagoCouplerSimulator> coupler_;
};

}  // namespace maroset::cli
