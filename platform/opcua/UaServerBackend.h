#pragma once

#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "platform/Clock.h"
#include "platform/EventLoop.h"
#include "platform/LinkIncidents.h"
#include "platform/opc/OpcServerBackend.h"
#include "platform/opcua/UaClient.h"
#include "platform/tcp/TcpNetwork.h"

namespace maroset::platform::opcua {

class UaItem;

// An OPC UA server behind the OPC automation objects, named by its endpoint URL. Item IDs
// are node ids in their text forms; a group is a subscription per update rate (publishing
// interval = sampling interval = the rate, queue size 1) and IsActive the monitoring and
// publishing mode. Values are cached from the data changes, so the group's scans read them
// at no cost; a write converts the value to the variable's data type (read when the item is
// added) and waits for the server's answer.
//
// Connect, adding an item and a write wait for the server while the loop keeps running, at
// most 5 s to connect and 2 s per service call. A server that is down or lost is tried
// again by the client (see UaClient); subscriptions and monitored items are made again once
// its session is back, and meanwhile the items read with bad quality.
class UaServerBackend final : public OpcServerBackend,
                              public std::enable_shared_from_this<UaServerBackend> {
  public:
    UaServerBackend(EventLoop& loop, const Clock& clock, TcpNetwork& network,
                    const LinkIncidents& incidents, std::string endpointUrl,
                    UaClient::Options options = {});
    ~UaServerBackend() override;

    void ClientConnected() override;
    void ClientDisconnected() override;
    int32_t AddItem(const std::string& itemID, std::shared_ptr<OpcItemSource>& item) override;
    // One Read of the items' values (an asynchronous read); false without a session.
    bool Refresh(const std::vector<std::shared_ptr<OpcItemSource>>& items,
                 std::function<void()> done) override;
    std::string VendorInfo() const override;

    UaClient& client() { return *client_; }

  private:
    friend class UaItem;
    struct Subscription {
        uint32_t id = 0;
        bool publishing = true;
    };

    void onState(UaClient::State s);
    void resolveAll();
    void sync();
    void dataChange(uint32_t subscription, uint32_t handle, DataValue& value);
    void detach(UaItem& item);
    void scanChanged();
    // Runs the loop until done() or the time is up; false when the time ran out.
    bool waitFor(const std::function<bool()>& done, std::chrono::milliseconds limit);
    void wake();
    // Every incident of this server goes through here: one per node using it. A refusal
    // carries the UA status, whose name is told beside the words.
    void trace(const std::string& text, uint32_t status = 0,
               IncidentKind kind = IncidentKind::Note);
    void badQuality(int32_t quality);

    EventLoop& loop_;
    const Clock& clock_;
    const LinkIncidents& incidents_;
    std::string url_;
    std::unique_ptr<UaClient> client_;
    int clients_ = 0;
    bool everActive_ = false;
    int waiting_ = 0;
    bool syncing_ = false;
    bool syncPosted_ = false;
    uint32_t nextHandle_ = 1;
    std::map<uint32_t, UaItem*> items_;                  // by client handle
    std::map<int32_t, Subscription> subscriptions_;      // by update rate
    std::vector<std::pair<uint32_t, uint32_t>> doomed_;  // subscription, monitored item
    std::set<std::string> nodes_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform::opcua
