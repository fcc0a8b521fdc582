#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "lang/Variant.h"
#include "lang/VbArray.h"
#include "platform/opc/OPCGroups.h"

namespace maroset::platform {

class OpcServerRegistry;
struct OpcConnection;

// The OPC automation server object: a client's connection to one OPC Data Access server,
// found by program identifier in the registry, and the root of its groups. Everything runs
// on the loop's thread; the groups' events are raised from the loop, never from inside a
// call.
//
// A failed call raises a VbError whose number is the OPC result code (a negative number:
// OPC_E_DUPLICATENAME is -1073479668) and whose description is the code's text.
class OPCServer {
  public:
    // Server states, as ServerState reports them.
    static constexpr int32_t OPCRunning = 1;
    static constexpr int32_t OPCDisconnected = 6;

    explicit OPCServer(OpcServerRegistry& registry);
    // Disconnects: the groups are removed and raise no more events.
    ~OPCServer();
    OPCServer(const OPCServer&) = delete;
    OPCServer& operator=(const OPCServer&) = delete;

    // Connects to the server registered as ProgID on this machine (Node empty or
    // "localhost"). An unknown identifier fails with Invalid class string (CO_E_CLASSSTRING)
    // and a description that names it; a server that is connected already fails with E_FAIL.
    void Connect(const std::string& ProgID, const std::string& Node = {});
    // Removes every group and drops the connection; nothing when not connected.
    void Disconnect();

    // The groups of this connection. Usable while connected; Add fails otherwise.
    platform::OPCGroups& OPCGroups() { return groups_; }

    // The server's text for a result code, as its message table has it, CR LF included.
    // Fails when not connected, and with E_INVALIDARG for a code the server has no text for.
    std::string GetErrorString(int32_t ErrorCode) const;

    // The program identifiers of the servers that can be connected, one-based.
    VbArray<Variant> GetOPCServers(const std::string& Node = {}) const;

    // The identifier connected to ("" when not connected), OPCRunning or OPCDisconnected,
    // and the server's vendor text.
    std::string ServerName() const;
    int32_t ServerState() const;
    std::string VendorInfo() const;

  private:
    OpcServerRegistry& registry_;
    std::shared_ptr<OpcConnection> connection_;
    platform::OPCGroups groups_;
};

}  // namespace maroset::platform
