#pragma once

#include <memory>

#include "cli/DemoStation.h"
#include "lang/Subscription.h"
#include "platform/Timer.h"
#include "sim/df1/Df1Simulator.h"

namespace maroset::cli {

// A DF1 PLC (NUVABDF1): node "PLC" scanning every 500 ms, its port 1 mapped to a
// pseudo-terminal on which the simulated PLC serves. The PLC counts N7:0 up, ramps N7:1 and
// runs N7:2 through values that go over the line as doubled DLEs; every third second the demo
// writes a new set point to N7:4, which comes back with the next poll. The write goes out
// halfway between two polls: a poll that finds a write unanswered would drop it.
class Df1Station : public DemoStation {
  public:
    static constexpr int32_t CounterHandle = 21;
    static constexpr int32_t LevelHandle = 22;
    static constexpr int32_t PatternHandle = 23;
    static constexpr int32_t SetpointHandle = 24;

    std::string title() const override { return "a DF1 PLC"; }
    void addNodes(const std::filesystem::path& project) override;
    void startSimulator() override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
    void stopSimulator() override;

  private:
    std::unique_ptr<sim::Df1Simulator> plc_;
    std::unique_ptr<platform::Timer> writer_;
    Subscription write_;
    int32_t setpoint_ = 0;
};

}  // namespace maroset::cli
