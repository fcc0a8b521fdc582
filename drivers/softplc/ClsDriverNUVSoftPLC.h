#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "core/Driver.h"
#include "drivers/softplc/FrmNUVTCPIP.h"
#include "lang/Subscription.h"
#include "lang/VbArray.h"

namespace maroset {

// The soft-PLC driver (type key "NUVTCPIP"). It does not poll: it subscribes its tags at the
// server ("TSL": scan rate, count, then handle and name of every tag) and passes up the values
// the server pushes ("NTV"). Writes go out as "NTV" (one value) and "ATV" (an array).
//
// - startup connects to IPAddress:Port without waiting for the connection.
// - IsActive(True) reconnects first when the socket is not connected, then sends the whole
//   subscription; IsActive(False) sends "RSL". While active, every tag added or removed
//   resends the whole subscription. A subscription sent while the reconnect is still under
//   way is lost; the next activation or tag change sends it again.
// - Link problems (no connection, no acknowledgement, "ERR" from the server) leave no trace
//   outside the client's link trace.
//
// Its error trap logs under the OPC driver's labels ("ClsDriverOPC", "ClsDriverOPC.WriteItem",
// ...): this driver was made from that one, and the log keeps showing them, as intended.
class ClsDriverNUVSoftPLC final : public Driver,
                                  public std::enable_shared_from_this<ClsDriverNUVSoftPLC> {
  public:
    ClsDriverNUVSoftPLC();
    ~ClsDriverNUVSoftPLC() override;

    const char* className() const override { return "ClsDriverNUVSoftPLC"; }

    void shutdown() override;
    void startup(std::string ServerName, std::string TopicName) override;
    void PostMessage(int32_t& lError) override;
    void IsActive(bool Active) override;
    void RemoveItem(int16_t ClientHandle) override;
    std::string GetErrorString(int32_t& lErrCode) override;
    int32_t WriteItem(int32_t ClientHandle, const Variant& value) override;
    bool AddItem(const std::string& TagName, int16_t ClientHandle) override;
    bool AddItems(int16_t NumItems, VbArray<std::string>& TagNames,
                  VbArray<int32_t>& ClientHandles) override;
    int32_t ReadItem(int32_t ClientHandle) override;
    int32_t ReadAllItems() override;
    // Sends the upper bound u as the count and elements 0 to u - 1: the element at u is not
    // sent. This is how the server has always been sent arrays, and it is kept.
    int32_t WriteArray(int32_t ClientHandle, VbArray<Variant>& data) override;

    // The driver's own members.
    void PostMessage(int32_t lError, const std::string& FromSub);
    // Points the socket at IPAddress:Port and starts connecting (the arguments are not used);
    // yields to the loop twice and does not wait for the connection.
    void ConnectServer(const std::string& strServerName, const std::string& strTopicName);
    // The elements from the lower to the upper bound, as text, separated by ",".
    std::string ConvertArrayToString(const Variant& vArrayData);

    // The pushed values of one frame from the client.
    void Client_DataArrival(const std::string& MessageID, const std::string& Message,
                            const std::string& RemoteIP, const std::string& RemoteHost);

    // The connection (null before startup and after shutdown), for tests and the trace.
    const std::shared_ptr<FrmNUVTCPIP>& client() const { return client_; }
    // The subscription as it is sent with "TSL".
    std::string SubscriptionList() const;

  private:
    FrmNUVTCPIP& requireClient() const;

    int16_t tagCount_ = 0;
    VbArray<int16_t> tagHandles_{1, 0};
    VbArray<Variant> tagNames_{1, 0};
    bool active_ = false;
    std::shared_ptr<FrmNUVTCPIP> client_;
    bool clientCreated_ = false;
    Subscription dataArrival_;
};

}  // namespace maroset
