#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "lang/Variant.h"

namespace maroset::platform {

class OPCGroup;
struct OpcConnection;

// The groups of one server connection (OPCServer.OPCGroups). A new group takes the
// defaults below; the client usually sets its IsSubscribed, IsActive and UpdateRate right
// after Add.
class OPCGroups {
  public:
    OPCGroups();
    ~OPCGroups();
    OPCGroups(const OPCGroups&) = delete;
    OPCGroups& operator=(const OPCGroups&) = delete;

    // Adds a group under a name unique on this connection (Empty: the server makes one up,
    // "Group1", "Group2", ...). Fails with OPC_E_DUPLICATENAME for a name in use (letter case
    // counts), and when the server is not connected.
    std::shared_ptr<OPCGroup> Add(const Variant& Name = {});
    // Removes every group: each stops its updates, raises no more events, and fails every
    // later call that needs the server. A client holding one keeps a dead object.
    void RemoveAll();
    int32_t Count() const { return static_cast<int32_t>(groups_.size()); }
    // The group of a name; null when there is none.
    std::shared_ptr<OPCGroup> GetOPCGroup(const std::string& Name) const;

    bool DefaultGroupIsActive = true;
    int32_t DefaultGroupUpdateRate = 1000;

  private:
    friend class OPCServer;
    void attach(std::shared_ptr<OpcConnection> connection);

    std::shared_ptr<OpcConnection> connection_;
    std::vector<std::shared_ptr<OPCGroup>> groups_;
    int32_t generatedNames_ = 0;
};

}  // namespace maroset::platform
