#include "platform/opc/OPCServer.h"

#include "lang/Strings.h"
#include "platform/opc/OpcConnection.h"
#include "platform/opc/OpcErrors.h"
#include "platform/opc/OpcServerRegistry.h"

namespace maroset::platform {

namespace {

constexpr const char* kSource = "OPCServer";

bool isLocal(const std::string& node) {
    const std::string n = UCase(node);
    return n.empty() || n == "LOCALHOST" || n == "127.0.0.1";
}

}  // namespace

OPCServer::OPCServer(OpcServerRegistry& registry) : registry_(registry) {}

OPCServer::~OPCServer() {
    Disconnect();
}

void OPCServer::Connect(const std::string& ProgID, const std::string& Node) {
    if (connection_) {
        throw opc::Failure(opc::E_FAIL, kSource,
                           "The OPCServer is connected to \"" + connection_->progID + "\" already");
    }
    if (!isLocal(Node)) {
        throw opc::Failure(opc::E_FAIL, kSource,
                           "OPC servers on other machines (\"" + Node + "\") are not supported");
    }
    auto backend = registry_.Find(ProgID);
    if (!backend) {
        throw opc::Failure(
            opc::CO_E_CLASSSTRING, kSource,
            "Invalid class string: no OPC server is registered as \"" + ProgID + "\"");
    }
    backend->ClientConnected();
    connection_ = std::make_shared<OpcConnection>(
        OpcConnection{ProgID, std::move(backend), registry_.loop(), registry_.clock()});
    groups_.attach(connection_);
}

void OPCServer::Disconnect() {
    if (!connection_) return;
    groups_.RemoveAll();
    groups_.attach(nullptr);
    const auto connection = std::move(connection_);
    connection_.reset();
    connection->backend->ClientDisconnected();
}

std::string OPCServer::GetErrorString(int32_t ErrorCode) const {
    if (!connection_) throw opc::Failure(opc::E_FAIL, kSource, "The OPCServer is not connected");
    if (auto text = connection_->backend->ErrorText(ErrorCode)) return *text;
    if (auto text = opc::StandardErrorText(ErrorCode)) return *text;
    throw opc::Failure(opc::E_INVALIDARG, kSource);
}

VbArray<Variant> OPCServer::GetOPCServers(const std::string& Node) const {
    if (!isLocal(Node)) {
        throw opc::Failure(opc::E_FAIL, kSource,
                           "OPC servers on other machines (\"" + Node + "\") are not supported");
    }
    const auto ids = registry_.ProgIDs();
    VbArray<Variant> list(1, static_cast<int32_t>(ids.size()));
    for (size_t i = 0; i < ids.size(); ++i) list(static_cast<int32_t>(i) + 1) = Variant(ids[i]);
    return list;
}

std::string OPCServer::ServerName() const {
    return connection_ ? connection_->progID : std::string();
}

int32_t OPCServer::ServerState() const {
    return connection_ ? OPCRunning : OPCDisconnected;
}

std::string OPCServer::VendorInfo() const {
    if (!connection_) throw opc::Failure(opc::E_FAIL, kSource, "The OPCServer is not connected");
    return connection_->backend->VendorInfo();
}

}  // namespace maroset::platform
