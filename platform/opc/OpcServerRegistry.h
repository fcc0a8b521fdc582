#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "platform/Clock.h"
#include "platform/EventLoop.h"
#include "platform/opc/OpcServerBackend.h"

namespace maroset::platform {

// The OPC servers this host can connect to, by program identifier ("Maroset.Simulation").
// OPCServer.Connect looks the identifier up here; an identifier that is not registered
// fails the Connect. It comes with the built-in simulated server registered; a host adds
// another server (a bridge to an OPC UA server, a test double) with Register, and every OPC
// node of the project can use it by naming its identifier in the node's OPCServer column,
// with nothing changed in the driver.
//
// The registry also hands the automation objects the loop their events run on and the clock
// of their time stamps.
class OpcServerRegistry {
  public:
    // The identifier of the built-in simulated server.
    static constexpr const char* SimulationProgID = "Maroset.Simulation";

    OpcServerRegistry(EventLoop& loop, const Clock& clock);
    ~OpcServerRegistry();
    OpcServerRegistry(const OpcServerRegistry&) = delete;
    OpcServerRegistry& operator=(const OpcServerRegistry&) = delete;

    // Registers (or replaces) the server of an identifier. Identifiers match in any letter
    // case, as the system's registered class names do. Connections made before keep the
    // backend they got.
    void Register(const std::string& progID, std::shared_ptr<OpcServerBackend> backend);
    // Removes an identifier; false when it was not registered.
    bool Unregister(const std::string& progID);
    // The server of an identifier; null when none is registered.
    std::shared_ptr<OpcServerBackend> Find(const std::string& progID) const;
    // Identifiers "SCHEME://..." (the scheme in any letter case) that are not registered
    // themselves are served by the backend `make` gives for each distinct identifier, made
    // on first use and kept: an OPC UA server is named by its endpoint URL ("opc.tcp://...").
    using Factory = std::function<std::shared_ptr<OpcServerBackend>(const std::string& progID)>;
    void RegisterScheme(const std::string& scheme, Factory make);
    // Every registered identifier as it was registered, ordered by identifier (letter case
    // ignored).
    std::vector<std::string> ProgIDs() const;

    EventLoop& loop() const { return loop_; }
    const Clock& clock() const { return clock_; }

  private:
    EventLoop& loop_;
    const Clock& clock_;
    // Keyed by the upper-cased identifier.
    std::map<std::string, std::pair<std::string, std::shared_ptr<OpcServerBackend>>> servers_;
    // Keyed by the upper-cased scheme; the backends made, by upper-cased identifier.
    std::map<std::string, Factory> schemes_;
    mutable std::map<std::string, std::shared_ptr<OpcServerBackend>> made_;
};

}  // namespace maroset::platform
