#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "core/Driver.h"
#include "lang/Subscription.h"

namespace maroset {

class FrmNUVIntech;

// The driver of NUVINTECH nodes: Intech instruments on one serial line. Each tag is served
// by one read command (see IntechTagName), and the line owner, FrmNUVIntech, polls the
// distinct commands in a chain and decodes the replies; values whose text changed go up to
// the host.
//
// - The line is always port 1 at "9600,n,8,1", whatever the node's CommPort and BaudRate.
// - Tags cannot be removed and there are no on-demand reads: values come only from polling.
// - Every AddItem forgets the last values, so every tag is reported again on its next reply.
// - A tag matches decoded names exactly: "01lai1" or "01LAI01" is polled but never reported.
// - WriteItem sends "@" + address + "EX DO 001" + value + " 0000:" for any tag, and with an
//   empty address for an unknown handle.
// - A silent instrument produces no values and no error reports.
class ClsDriverIntech final : public Driver, public std::enable_shared_from_this<ClsDriverIntech> {
  public:
    ClsDriverIntech();
    ~ClsDriverIntech() override;

    const char* className() const override { return "ClsDriverIntech"; }

    // The node name also picks the node's own port mapping and names the link trace.
    void NodeName(const std::string& v) override;
    using Driver::NodeName;

    void shutdown() override;
    void startup(std::string ServerName, std::string TopicName) override;
    void PostMessage(int32_t& lError) override;
    void IsActive(bool Active) override;
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    int32_t WriteItem(int32_t ClientHandle, const Variant& value) override;
    // Returns False, always.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    int32_t ReadItem(int32_t ClientHandle) override;
    int32_t ReadAllItems() override;
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // Handlers of the line owner's events.
    void NUVIntech_ReadComplete(VbArray<Variant>& TagNames, VbArray<Variant>& Values);
    void NUVIntech_Complete(const std::string& message);

    // The tag table, for inspection: indices 1 to TagCount + 1, the top entry empty.
    int16_t TagCount() const { return TagCount_; }
    const VbArray<Variant>& TagNames() const { return TagNames_; }
    const VbArray<int16_t>& TagHandles() const { return TagHandles_; }
    const VbArray<Variant>& LastValues() const { return LastValues_; }
    int32_t CommandCount() const { return CommandCount_; }
    // The line owner (empty before startup and after shutdown).
    const std::shared_ptr<FrmNUVIntech>& NUVIntech() const { return NUVIntech_; }

  private:
    FrmNUVIntech& owner() const;

    int16_t TagCount_ = 0;
    VbArray<Variant> TagNames_{1, 1};
    VbArray<int16_t> TagHandles_{1, 1};
    VbArray<Variant> LastValues_{1, 1};
    int32_t CommandCount_ = 0;
    std::shared_ptr<FrmNUVIntech> NUVIntech_;
    Subscription readComplete_;
    Subscription complete_;
};

}  // namespace maroset
