#include "drivers/local/ClsDriverMemTag.h"

#include "core/Procedure.h"
#include "core/ValueReport.h"

namespace maroset {

namespace {
constexpr const char* kModule = "ClsDriverMemTag";
}

// Only WriteItem does anything, so only it has a statement to trap.
void ClsDriverMemTag::shutdown() {}

void ClsDriverMemTag::startup(std::string, std::string) {}

void ClsDriverMemTag::PostMessage(int32_t&) {}

void ClsDriverMemTag::IsActive(bool) {}

void ClsDriverMemTag::RemoveItem(int16_t) {}

std::string ClsDriverMemTag::GetErrorString(int32_t&) {
    return {};
}

int32_t ClsDriverMemTag::WriteItem(int32_t ClientHandle, const Variant& data) {
    Procedure proc(kModule, "WriteItem");
    proc.run([&] { ReportValue(*this, ClientHandle, data); });
    return 0;
}

bool ClsDriverMemTag::AddItem(const std::string&, int16_t) {
    return false;
}

bool ClsDriverMemTag::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    return false;
}

int32_t ClsDriverMemTag::ReadItem(int32_t) {
    return 0;
}

int32_t ClsDriverMemTag::ReadAllItems() {
    return 0;
}

int32_t ClsDriverMemTag::WriteArray(int32_t, VbArray<Variant>&) {
    return 0;
}

}  // namespace maroset
