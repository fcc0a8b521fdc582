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
    const std::string key = UCase(progID);
    if (const auto it = servers_.find(key); it != servers_.end()) return it->second.second;
    const size_t colon = key.find("://");
    if (colon == std::string::npos) return nullptr;
    const auto scheme = schemes_.find(key.substr(0, colon));
    if (scheme == schemes_.end()) return nullptr;
    auto& backend = made_[key];
    if (!backend) backend = scheme->second(progID);
    return backend;
}

void OpcServerRegistry::RegisterScheme(const std::string& scheme, Factory make) {
    schemes_[UCase(scheme)] = std::move(make);
}

std::vector<std::string> OpcServerRegistry::ProgIDs() const {
    std::vector<std::string> ids;
    for (const auto& [key, entry] : servers_) ids.push_back(entry.first);
    return ids;
}

}  // namespace maroset::platform
