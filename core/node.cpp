#include "core/node.h"

#include "core/DriverCatalog.h"
#include "core/Procedure.h"
#include "lang/Conversions.h"
#include "lang/Strings.h"

namespace maroset {

namespace {

constexpr const char* kModule = "node";

// The handle as a 16-bit integer, as AddItem and RemoveItem declare it (Overflow outside
// -32768..32767, before the driver runs).
int16_t shortHandle(int32_t handle) {
    return CInt(Variant(handle));
}

}  // namespace

node::~node() {
    Procedure proc(kModule, "Class_Terminate");
    try {
        proc.run([&] { requireDriver()->shutdown(); });
    } catch (...) {
        // Nothing can reach a caller from here.
    }
}

std::shared_ptr<Driver> node::requireDriver() const {
    // A copy: the driver stays alive for the call even if the node drops it meanwhile.
    if (!driver_) throw VbError(err::ObjectNotSet);
    return driver_;
}

void node::Init() {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "Init");
    proc.run([&] { driverType_ = UCase(CStr(DriverName)); });

    // Each type gets its properties and startup in its own order; the orders are intended.
    auto create = [&](const char* cls) { proc.run([&] { driver_ = CreateDriver(cls); }); };
    auto step = [&](auto&& statement) { proc.run([&] { statement(*requireDriver()); }); };
    auto nodeName = [&](Driver& drv) { drv.NodeName(Name); };

    if (driverType_ == "MEMTAG") {
        create("ClsDriverMemTag");
        step(nodeName);
    } else if (driverType_ == "DISKTAG") {
        create("ClsDriverDiskTag");
        step([&](Driver& drv) { drv.startup("ServerName", Name); });
        step(nodeName);
    } else if (driverType_ == "OPC") {
        create("ClsDriverOPC");
        step([&](Driver& drv) { drv.OPCTopic(OPCTopic); });
        step([&](Driver& drv) { drv.ScanRate(ScanRate); });
        step([&](Driver& drv) { drv.startup(CStr(ServerName), Name); });
        step([&](Driver& drv) { drv.TagPrefex(TagPrefex); });
        step(nodeName);
    } else if (driverType_ == "WAGOIO") {
        create("ClsDriverWagoIO");
        step([&](Driver& drv) { drv.ScanRate(ScanRate); });
        step([&](Driver& drv) { drv.IPAddress(IPAddress); });
        step([&](Driver& drv) { drv.Port(Port); });
        step([&](Driver& drv) { drv.startup("WagoIO", Name); });
        step([&](Driver& drv) { drv.TagPrefex(TagPrefex); });
        step(nodeName);
    } else if (driverType_ == "NUVINTECH") {
        create("ClsDriverIntech");
        step(nodeName);
        step([&](Driver& drv) { drv.ScanRate(ScanRate); });
        step([&](Driver& drv) { drv.startup(" ", Name); });
        step(nodeName);  // a second time, as intended
    } else if (driverType_ == "NUVABDF1") {
        create("ClsDriverNuvAbDf1");
        step([&](Driver& drv) { drv.ScanRate(ScanRate); });
        step([&](Driver& drv) { drv.startup(" ", Name); });
        step(nodeName);
    } else if (driverType_ == "NUVTCPIP") {
        create("ClsDriverNUVSoftPLC");
        step([&](Driver& drv) { drv.ScanRate(ScanRate); });
        step(nodeName);  // before startup, as intended
        step([&](Driver& drv) { drv.IPAddress(IPAddress); });
        step([&](Driver& drv) { drv.Port(Port); });
        step([&](Driver& drv) { drv.startup("NUVTCPIP", Name); });
    } else {
        create("ClsDriverMemTag");
        step(nodeName);
    }
    proc.run([&] { initialised_ = true; });
}

void node::AddTag(int32_t TagID, const std::string& TagAddress) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "AddTag");
    proc.run([&] {
        if (!initialised_) Init();
    });
    proc.run([&] { requireDriver()->AddItem(TagAddress, shortHandle(TagID)); });
}

void node::RemoveTag(int32_t TagID) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "RemoveTag");
    proc.run([&] { requireDriver()->RemoveItem(shortHandle(TagID)); });
}

void node::ReadTag(int32_t TagID) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "ReadTag");
    proc.run([&] { requireDriver()->ReadItem(TagID); });
}

Variant node::WriteTag(const std::string& TagID, const Variant& value) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "WriteTag");
    proc.run([&] {
        requireDriver()->WriteItem(CLng(Variant(TagID)),
                                   value);  // the driver's result is discarded
    });
    return {};
}

bool node::IsActive() const {
    Procedure proc(kModule, "IsActive");
    bool result = false;
    proc.run([&] { result = CBool(isActive_); });
    return result;
}

void node::IsActive(bool NewValue) {
    // No trap of its own: a failure always reaches the caller.
    const auto self = weak_from_this().lock();
    requireDriver()->IsActive(NewValue);
}

void node::browse() {}

Variant node::WriteArray(const std::string& TagID, VbArray<Variant>& Values) {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "WriteArray");
    proc.run([&] { requireDriver()->WriteArray(CLng(Variant(TagID)), Values); });
    return {};
}

}  // namespace maroset
