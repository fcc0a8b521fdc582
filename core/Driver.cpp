#include "core/Driver.h"

#include "lang/VbError.h"

namespace maroset {

void Driver::missing() {
    throw VbError(err::NotSupported);
}

void Driver::startup(std::string, std::string) {
    missing();
}
void Driver::PostMessage(int32_t&) {
    missing();
}
void Driver::IsActive(bool) {
    missing();
}
void Driver::RemoveItem(int16_t) {
    missing();
}
std::string Driver::GetErrorString(int32_t&) {
    missing();
}
int32_t Driver::WriteItem(int32_t, const Variant&) {
    missing();
}
bool Driver::AddItem(const std::string&, int16_t) {
    missing();
}
bool Driver::AddItems(int16_t, VbArray<std::string>&, VbArray<int32_t>&) {
    missing();
}
int32_t Driver::ReadItem(int32_t) {
    missing();
}
int32_t Driver::ReadAllItems() {
    missing();
}
int32_t Driver::WriteArray(int32_t, VbArray<Variant>&) {
    missing();
}

}  // namespace maroset
