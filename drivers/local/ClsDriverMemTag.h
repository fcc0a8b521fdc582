#pragma once

#include "core/Driver.h"

namespace maroset {

// Tags that live only in the host. Nothing is stored: a written value is reported straight
// back as one ValueChange before WriteItem returns, so every client watching the tag sees the
// write; reads have nothing to return. Also the driver of a node whose type key is unknown.
class ClsDriverMemTag final : public Driver {
  public:
    const char* className() const override { return "ClsDriverMemTag"; }

    void shutdown() override;
    void startup(std::string ServerName, std::string TopicName) override;
    void PostMessage(int32_t& lError) override;
    void IsActive(bool NewValue) override;
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    int32_t WriteItem(int32_t ClientHandle, const Variant& data) override;
    // Returns False although the tag is usable.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    int32_t ReadItem(int32_t ClientHandle) override;
    int32_t ReadAllItems() override;
    // Arrays are not looped back.
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;
};

}  // namespace maroset
