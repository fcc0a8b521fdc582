#include "platform/opc/OPCGroups.h"

#include "lang/Conversions.h"
#include "platform/opc/OPCGroup.h"
#include "platform/opc/OpcConnection.h"
#include "platform/opc/OpcErrors.h"

namespace maroset::platform {

namespace {
constexpr const char* kSource = "OPCGroups";
}

OPCGroups::OPCGroups() = default;

OPCGroups::~OPCGroups() {
    RemoveAll();
}

void OPCGroups::attach(std::shared_ptr<OpcConnection> connection) {
    connection_ = std::move(connection);
}

std::shared_ptr<OPCGroup> OPCGroups::Add(const Variant& Name) {
    if (!connection_) throw opc::Failure(opc::E_FAIL, kSource, "The OPCServer is not connected");
    std::string name;
    if (Name.isEmpty()) {
        do {
            name = "Group" + std::to_string(++generatedNames_);
        } while (GetOPCGroup(name));
    } else {
        name = CStr(Name);
        if (GetOPCGroup(name)) throw opc::Failure(opc::OPC_E_DUPLICATENAME, kSource);
    }
    auto group = std::make_shared<OPCGroup>(OPCGroup::Token{}, connection_, name,
                                            DefaultGroupIsActive, DefaultGroupUpdateRate);
    groups_.push_back(group);
    return group;
}

void OPCGroups::RemoveAll() {
    auto groups = std::move(groups_);
    groups_.clear();
    for (const auto& g : groups) g->detach();
}

std::shared_ptr<OPCGroup> OPCGroups::GetOPCGroup(const std::string& Name) const {
    for (const auto& g : groups_) {
        if (g->Name() == Name) return g;
    }
    return nullptr;
}

}  // namespace maroset::platform
