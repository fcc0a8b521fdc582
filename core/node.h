#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "core/Driver.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

// One configured device connection: its configuration (one row of the project's Nodes table),
// the one driver its type key selects, and the host's tag operations forwarded to that driver.
//
// Every operation but the IsActive assignment runs under the trap with module name "node".
// Operations other than AddTag on a node that was never initialised fail with Object variable
// not set (91). A node keeps itself alive for the length of each operation, so a host may drop
// its last reference from inside an event the operation raised.
class node : public std::enable_shared_from_this<node> {
  public:
    node() = default;
    // Class_Terminate: shuts the driver down.
    ~node();
    node(const node&) = delete;
    node& operator=(const node&) = delete;

    int32_t NodeID = 0;
    std::string Name;
    Variant DriverName;
    Variant ScanRate;
    std::string NodeName;  // held only: drivers get the node's Name
    Variant OPCTopic;
    Variant ServerName;
    Variant SerialPort;  // held only: the serial drivers use fixed line settings
    Variant BaudRate;    // held only
    Variant TagPrefex;
    Variant IPAddress;
    Variant Port;

    // Creates and configures the driver of the type key's family (the upper-cased DriverName;
    // see DriverCatalog.h), each family in its own fixed order. Calling it again replaces the
    // driver without shutting the old one down.
    void Init();
    void AddTag(int32_t TagID, const std::string& TagAddress);
    void RemoveTag(int32_t TagID);
    void ReadTag(int32_t TagID);
    Variant WriteTag(const std::string& TagID, const Variant& value);
    // Reads False whatever was assigned: the read side never sees the assignments.
    bool IsActive() const;
    void IsActive(bool NewValue);
    void browse();
    Variant WriteArray(const std::string& TagID, VbArray<Variant>& Values);

    // The driver object, empty until Init (for hosts that call a driver directly).
    const std::shared_ptr<Driver>& driver() const { return driver_; }

  private:
    std::shared_ptr<Driver> requireDriver() const;

    std::shared_ptr<Driver> driver_;
    std::string driverType_;
    bool initialised_ = false;
    Variant isActive_;
};

}  // namespace maroset
