#pragma once

#include "cli/DemoStation.h"

namespace maroset::cli {

// OPC (OPC): node "Opc" on the built-in simulated server "Maroset.Simulation", updating every
// 500 ms. Its ramp item counts the seconds since it was added; the demo writes a new set
// point into its static item every second, and the server reports it back in its next data
// change. Nothing to start: the server lives in the library.
class OpcStation : public DemoStation {
  public:
    static constexpr int32_t RampHandle = 61;
    static constexpr int32_t SetpointHandle = 62;

    std::string title() const override { return "an OPC server"; }
    void addNodes(const std::filesystem::path& project) override;
    void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) override;
    void tick(nodeDB& db, int32_t second) override;
};

}  // namespace maroset::cli
