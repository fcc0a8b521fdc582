#include "platform/opc/OpcServerRegistry.h"

#include "lang/Strings.h"
#include "platform/opc/SimulationServer.h"

namespace maroset::platform {

OpcServerRegistry::OpcServerRegistry(EventLoop& loop, const Clock& clock)
    : loop_(loop), clock_(clock) {
    Register(SimulationProgID, std::make_shared<SimulationServer>(loop, clock));
}

OpcServerRegistry::~OpcServerRegistry() = default;

void OpcServerRegistry::Register(const std::string& progID,
                                 std::shared_ptr<OpcServerBackend> backend) {
    servers_[UCase(progID)] = {progID, std::move(backend)};
}

bool OpcServerRegistry::Unregister(const std::string& progID) {
    return servers_.erase(UCase(progID)) > 0;
}

std::shared_ptr<OpcServerBackend> OpcServerRegistry::Find(const std::string& progID) const {
    const auto it = servers_.find(UCase(progID));
    return it == servers_.end() ? nullptr : it->second.second;
}

std::vector<std::string> OpcServerRegistry::ProgIDs() const {
    std::vector<std::string> ids;
    for (const auto& [key, entry] : servers_) ids.push_back(entry.first);
    return ids;
}

}  // namespace maroset::platform
