#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>

#include "platform/Clock.h"
#include "platform/EventLoop.h"
#include "platform/opc/OpcServerBackend.h"

namespace maroset::platform {

// The built-in simulated OPC server, registered as "Maroset.Simulation". Its address space:
// - "Static.<any name>": readable and writable; holds the last value written (any Variant
//   type), initially the 32-bit integer 0. One value per item ID, shared by every group and
//   connection of this server, as a device register is.
// - "Ramp.<any name>": a read-only 32-bit integer that starts at 0 when the item is added and
//   grows by one every second after that (each added item counts from its own start); a
//   write fails with OPC_E_BADRIGHTS.
// - any other item ID (the prefixes match in this letter case only): OPC_E_UNKNOWNITEMID.
// Every value has good quality (192); its time stamp is the time it last changed.
//
// The typed members below are the device side, for tests and operators.
class SimulationServer final : public OpcServerBackend {
  public:
    SimulationServer(const EventLoop& loop, const Clock& clock);
    ~SimulationServer() override;

    void ClientConnected() override { ++connections_; }
    void ClientDisconnected() override { --connections_; }
    int32_t AddItem(const std::string& itemID, std::shared_ptr<OpcItemSource>& item) override;
    std::string VendorInfo() const override;

    // The value of a Static item; nothing for an item ID never added or set.
    std::optional<Variant> StaticValue(const std::string& itemID) const;
    // Changes a Static item's value from the device side (creating it when new); a group
    // holding it reports the change at its next update.
    void SetStatic(const std::string& itemID, const Variant& value);
    // Clients connected now.
    int32_t Connections() const { return connections_; }

    static constexpr const char* StaticPrefix = "Static.";
    static constexpr const char* RampPrefix = "Ramp.";

  private:
    std::shared_ptr<OpcItemState> cell(const std::string& itemID);

    const EventLoop& loop_;
    const Clock& clock_;
    std::unordered_map<std::string, std::shared_ptr<OpcItemState>> statics_;
    int32_t connections_ = 0;
};

}  // namespace maroset::platform
