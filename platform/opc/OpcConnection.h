#pragma once

#include <memory>
#include <string>

#include "platform/Clock.h"
#include "platform/EventLoop.h"
#include "platform/opc/OpcServerBackend.h"

namespace maroset::platform {

// One client's connection to a server, shared by the automation objects made under it
// (OPCServer, its OPCGroups, each OPCGroup and its OPCItems): the backend, the loop their
// events run on and the clock of their time stamps. Internal to the automation objects.
struct OpcConnection {
    std::string progID;
    std::shared_ptr<OpcServerBackend> backend;
    EventLoop& loop;
    const Clock& clock;
};

}  // namespace maroset::platform
