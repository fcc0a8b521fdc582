#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "lang/Event.h"
#include "lang/Subscription.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"
#include "platform/Clock.h"
#include "platform/Timer.h"
#include "platform/opc/OPCItems.h"

namespace maroset::platform {

struct OpcConnection;

// One group of a server connection (OPCGroups.Add): a set of items with one update rate,
// and the events that deliver their values. All arrays are one-based.
//
// Events, raised on the loop's thread (never from inside a call of the client):
// - DataChange(TransactionID, NumItems, ClientHandles, ItemValues, Qualities, TimeStamps):
//   while the group is active and subscribed, once every UpdateRate milliseconds that some
//   item changed (value or quality) since the group last reported it, holding exactly those
//   items in the order they were added. The first one after activation holds every item,
//   and an item added since the last one is in the next one, whatever the values.
//   TransactionID 0.
// - AsyncReadComplete(TransactionID, NumItems, ClientHandles, ItemValues, Qualities,
//   TimeStamps, Errors): the answer to AsyncRead, at the next turn of the loop, with the
//   values of that moment, whether the group is active or not.
// - AsyncWriteComplete(TransactionID, NumItems, ClientHandles, Errors): the answer to
//   AsyncWrite, once the values are written.
// A handler may call anything on the group, the server or the client's own objects, and may
// release the group.
class OPCGroup : public std::enable_shared_from_this<OPCGroup> {
  public:
    using DataChangeEvent = Event<int32_t, int32_t, VbArray<int32_t>&, VbArray<Variant>&,
                                  VbArray<int32_t>&, VbArray<DateTime>&>;
    using AsyncReadCompleteEvent = Event<int32_t, int32_t, VbArray<int32_t>&, VbArray<Variant>&,
                                         VbArray<int32_t>&, VbArray<DateTime>&, VbArray<int32_t>&>;
    using AsyncWriteCompleteEvent = Event<int32_t, int32_t, VbArray<int32_t>&, VbArray<int32_t>&>;

    // The fastest update rate: a smaller request (0 included, "as fast as possible") is
    // revised to it, and UpdateRate reads the revised rate.
    static constexpr int32_t FastestUpdateRate = 10;

    // Made by OPCGroups::Add only.
    struct Token {};
    OPCGroup(Token, std::shared_ptr<OpcConnection> connection, std::string name, bool active,
             int32_t updateRate);
    ~OPCGroup();
    OPCGroup(const OPCGroup&) = delete;
    OPCGroup& operator=(const OPCGroup&) = delete;

    const std::string& Name() const { return name_; }

    bool IsActive() const { return active_; }
    // Activating starts the updates afresh: the first data change reports every item.
    void IsActive(bool value);
    bool IsSubscribed() const { return subscribed_; }
    void IsSubscribed(bool value);
    int32_t UpdateRate() const { return updateRate_; }
    // Milliseconds; a negative rate fails with E_INVALIDARG.
    void UpdateRate(int32_t value);

    platform::OPCItems& OPCItems() { return items_; }

    // Reads NumItems items by server handle; Errors (re-dimensioned 1 to NumItems) holds S_OK
    // or OPC_E_INVALIDHANDLE for each. The values of the accepted items come with one
    // AsyncReadComplete, once a server that reads from its device has read them (an OPC UA
    // server: one Read), otherwise at the next turn of the loop; none comes when no item was
    // accepted. CancelID identifies the request.
    void AsyncRead(int32_t NumItems, const VbArray<int32_t>& ServerHandles,
                   VbArray<int32_t>& Errors, int32_t TransactionID, int32_t& CancelID);
    // Writes Values(i) to the item of ServerHandles(i). An unknown handle
    // (OPC_E_INVALIDHANDLE), an item that may not be written (OPC_E_BADRIGHTS) or a value
    // no server can hold (an object: OPC_E_BADTYPE) is refused in Errors at once; the
    // others are written at the next turn of the loop and answered with one
    // AsyncWriteComplete holding each write's result.
    void AsyncWrite(int32_t NumItems, const VbArray<int32_t>& ServerHandles,
                    const VbArray<Variant>& Values, VbArray<int32_t>& Errors, int32_t TransactionID,
                    int32_t& CancelID);

    DataChangeEvent DataChange;
    AsyncReadCompleteEvent AsyncReadComplete;
    AsyncWriteCompleteEvent AsyncWriteComplete;

    // False once the group was removed from its server (OPCGroups.RemoveAll, Disconnect).
    bool live() const { return connection_ != nullptr; }

  private:
    friend class OPCGroups;
    void detach();
    void requireLive(const char* what) const;
    void rearm();
    void update();

    struct ReadRequest;
    struct WriteRequest;
    void completeRead(const ReadRequest& request);
    void completeWrite(WriteRequest& request);

    std::shared_ptr<OpcConnection> connection_;
    std::string name_;
    bool active_;
    bool subscribed_ = false;
    int32_t updateRate_;
    platform::OPCItems items_;
    Timer timer_;
    Subscription tick_;
    int32_t nextCancelID_ = 1;
    // The data change being built, kept from one update to the next so that an update does
    // not allocate. An update is never re-entered (the timer sees to that).
    std::vector<OPCItems::Entry*> changed_;
    std::vector<DateTime> changedAt_;
    VbArray<int32_t> clientHandles_;
    VbArray<Variant> itemValues_;
    VbArray<int32_t> qualities_;
    VbArray<DateTime> timeStamps_;
};

}  // namespace maroset::platform
