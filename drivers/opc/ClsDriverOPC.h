#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "core/Driver.h"
#include "lang/Subscription.h"
#include "lang/VbArray.h"
#include "platform/Clock.h"
#include "platform/LinkIncident.h"

namespace maroset {

namespace platform {
class OPCServer;
class OPCGroup;
}  // namespace platform

// The driver of OPC nodes: a client of one OPC Data Access server, found by the program
// identifier the node passes to startup (the node's OPCServer column), through the OPC
// automation objects. Each driver has its own connection and one group, named after the
// node, whose items are the node's tags: item ID = TagPrefex + tag name, client handle = the
// host's handle (1 to 32767). Data changes of the active group go up as value reports, one
// per event, with the server's arrays as they came; reads and writes are asynchronous.
// Item errors of AddItem, AddItems and ReadItem go up as error reports ("OPC Driver");
// write errors are not reported.
//
// Error trapping: AddItem, AddItems, RemoveItem, ReadItem, WriteItem, WriteArray and
// ConnectServer always trap and log, whatever the trap switch says; shutdown, GetErrorString
// and PostMessage ignore errors; the others follow the switch. The group's events come from
// the loop; an error that escapes their handlers is traced under the node's name.
//
// There is no ReadAllItems: a host that calls it gets error 438.
class ClsDriverOPC final : public Driver {
  public:
    ClsDriverOPC();
    ~ClsDriverOPC() override;

    const char* className() const override { return "ClsDriverOPC"; }

    // Removes the group, disconnects and releases the server, ignoring errors. Connected stays
    // set: a later startup on the same object does nothing.
    void shutdown() override;
    // Once per object: creates the server object and connects (ConnectServer).
    void startup(std::string ServerName, std::string TopicName) override;
    // The contract's form, FromSub omitted.
    void PostMessage(int32_t& lError) override;
    // Reports the server's text of lError as an error report under the node's name:
    // (NodeName, FromSub, "PostMessage...: " + text).
    void PostMessage(int32_t lError, const std::string& FromSub);
    // The group is active only for True.
    void IsActive(bool NewValue) override;
    void RemoveItem(int16_t ClientHandle) override;
    // The server's text, its CR LF cut off; "" when there is none.
    std::string GetErrorString(int32_t& lErrCode) override;
    // Asynchronous; the result is always 0.
    int32_t WriteItem(int32_t ClientHandle, const Variant& data) override;
    // True when the group holds at least one item afterwards.
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    // The value comes later as a value report, and only while the group is active.
    int32_t ReadItem(int32_t ClientHandle) override;
    // The whole array as the one item's value; logs under "WriteItem".
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // Connects to the server and makes the node's group: subscribed, inactive, updating at
    // ScanRate.
    void ConnectServer(const std::string& strServerName, const std::string& strTopicName);
    // The elements from the lower to the upper bound joined by ",".
    std::string ConvertArrayToString(const Variant& vArrayData);

    // Handlers of the group's events.
    void MyOPCGroup_DataChange(int32_t TransactionID, int32_t NumItems,
                               VbArray<int32_t>& ClientHandles, VbArray<Variant>& ItemValues,
                               VbArray<int32_t>& Qualities,
                               VbArray<platform::DateTime>& TimeStamps);
    void MyOPCGroup_AsyncReadComplete(int32_t TransactionID, int32_t NumItems,
                                      VbArray<int32_t>& ClientHandles, VbArray<Variant>& ItemValues,
                                      VbArray<int32_t>& Qualities,
                                      VbArray<platform::DateTime>& TimeStamps,
                                      VbArray<int32_t>& Errors);
    void MyOPCGroup_AsyncWriteComplete(int32_t TransactionID, int32_t NumItems,
                                       VbArray<int32_t>& ClientHandles, VbArray<int32_t>& Errors);

    // The state, for hosts and tests that look at it.
    bool Connected() const { return connected_; }
    int16_t MaxHandle() const { return maxHandle_; }
    // Server handle by client handle, 1 to MaxHandle; 0 for a handle without an item.
    const VbArray<int32_t>& ServerHandles() const { return serverHandles_; }
    const std::shared_ptr<platform::OPCServer>& server() const { return server_; }
    const std::shared_ptr<platform::OPCGroup>& group() const { return group_; }

  private:
    void setGroup(std::shared_ptr<platform::OPCGroup> group);
    std::string traceSource() const;
    // Tells an incident of the node's link to its server; the words are built only when a
    // reader asks for them.
    template <class Text>
    void trace(platform::IncidentKind kind, Text&& text, std::string_view tag = {}) const;

    std::shared_ptr<platform::OPCServer> server_;
    std::shared_ptr<platform::OPCGroup> group_;  // MyOPCGroup
    bool connected_ = false;
    int16_t maxHandle_ = 0;
    VbArray<int32_t> serverHandles_{1, 0};
    std::string topic_;
    // The server as named to ConnectServer (program identifier or endpoint URL).
    std::string serverName_;
    // After group_, so they go first.
    Subscription dataChange_;
    Subscription readComplete_;
    Subscription writeComplete_;
};

}  // namespace maroset
