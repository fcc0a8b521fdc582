#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/opc/OpcItemSource.h"

namespace maroset::platform {

// A server behind the automation objects: what OPCServer.Connect reaches through the
// registry (OpcServerRegistry) by its program identifier. The automation objects (groups,
// items, update rates, change detection, asynchronous reads and writes, their events) are
// the same for every server; a backend only resolves item IDs into items and gives its own
// error texts. The built-in one is the simulated server (SimulationServer); another one,
// for example a bridge to an OPC UA server, plugs in as one more registry entry.
//
// All calls come on the loop's thread. A backend serves any number of connections at once.
class OpcServerBackend {
  public:
    virtual ~OpcServerBackend() = default;

    // A client connects to it (OPCServer.Connect) or disconnects. A backend that cannot
    // serve throws the run-time error the client's Connect should fail with.
    virtual void ClientConnected() {}
    virtual void ClientDisconnected() {}

    // Resolves an item ID for a group that adds it: S_OK and the item, or the result code
    // that refuses it (OPC_E_UNKNOWNITEMID, OPC_E_INVALIDITEMID, ...) and no item.
    virtual int32_t AddItem(const std::string& itemID, std::shared_ptr<OpcItemSource>& item) = 0;

    // Reads items afresh from the device for an asynchronous read, and calls done on the
    // loop once their states are current (or the device did not answer): true when it
    // does. False (the default) leaves the read to the states the items hold, at the next
    // turn of the loop.
    virtual bool Refresh(const std::vector<std::shared_ptr<OpcItemSource>>&,
                         std::function<void()>) {
        return false;
    }

    // The server's text for one of its own result codes, with the message table's CR LF at
    // the end; nothing leaves it to the standard texts.
    virtual std::optional<std::string> ErrorText(int32_t) const { return std::nullopt; }

    // The vendor text of OPCServer.VendorInfo.
    virtual std::string VendorInfo() const = 0;
};

}  // namespace maroset::platform
