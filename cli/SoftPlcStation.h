#pragma once

#include <memory>

#include "cli/DemoStation.h"
#include "sim/softplc/SoftPlcSimulator.h"

namespace maroset::cli {

// A soft PLC (NUVTCPIP): node "SoftPLC" at the soft-PLC simulator on 127.0.0.1 (a free port),
// update rate 1000. The node subscribes three tags; the server pushes their values as they
// move, once a second, and every third second the demo writes a new setpoint, which the
// server pushes back. Values arrive as text.
class SoftPlcStation : public DemoStation {
  public:
    static constexpr int32_t LevelHandle = 41;
    static constexpr int32_t FlowHandle = 42;
    static constexpr int32_t SetpointHandle = 43;

    std::string title() const override { return "a soft PLC"; }
    void addNodes(const std::filesystem::path& project) override;
    void startSimulator() override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
    void stopSimulator() override;

  private:
    std::unique_ptr<sim::SoftPlcSimulator> simulator_;
};

}  // namespace maroset::cli
