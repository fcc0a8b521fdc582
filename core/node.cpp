#include "core/node.h"

#include "core/DriverCatalog.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
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
    Runtime::current().linkStatus().NodeGone(Name, this);
}

std::shared_ptr<Driver> node::requireDriver() const {
    // A copy: the driver stays alive for the call even if the node drops it meanwhile.
    if (!driver_) throw VbError(err::ObjectNotSet);
    return driver_;
}

void node::Init() {
    const auto self = weak_from_this().lock();
    Procedure proc(kModule, "Init");
    LinkStatusBoard::StartScope starting(Runtime::current().linkStatus(), Name, this);
    // A step that fails is told to the link status, then goes its usual way (to the host, or
    // to the trap's handler, which tells it too: once more does no harm).
    auto told = [&](auto&& statement) {
        try {
            statement();
        } catch (const VbError& e) {
            Runtime::current().linkStatus().StartError(e);
            throw;
        }
    };
    proc.run([&] { told([&] { driverType_ = UCase(CStr(DriverName)); }); });
    // The family creates its driver and gives it its properties and startup in its own order.
    const DriverFamily& family = DriverFamilyOf(driverType_);
    starting.typeKnown(family.typeKey);
    proc.run([&] { told([&] { driver_ = family.create(); }); });
    family.configure(*this, [&](const std::function<void(Driver&)>& statement) {
        proc.run([&] { told([&] { statement(*requireDriver()); }); });
    });
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
