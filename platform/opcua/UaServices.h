#pragma once

#include "platform/opcua/UaCodec.h"

namespace maroset::platform::opcua {

// The messages this client exchanges, as descriptions the generic encoder and decoder walk
// (member lists as OPC 10000-4, Services, and OPC 10000-6, Mappings, give them). A request's
// values start with its RequestHeader's, a response's with its ResponseHeader's.
namespace msg {
extern const StructType RequestHeader;
extern const StructType ResponseHeader;
extern const StructType ServiceFault;
extern const StructType OpenSecureChannelRequest;
extern const StructType OpenSecureChannelResponse;
extern const StructType CloseSecureChannelRequest;
extern const StructType CreateSessionRequest;
extern const StructType CreateSessionResponse;
extern const StructType ActivateSessionRequest;
extern const StructType ActivateSessionResponse;
extern const StructType CloseSessionRequest;
extern const StructType ReadRequest;
extern const StructType ReadResponse;
extern const StructType WriteRequest;
extern const StructType WriteResponse;
extern const StructType CreateSubscriptionRequest;
extern const StructType CreateSubscriptionResponse;
extern const StructType SetPublishingModeRequest;
extern const StructType StatusResultsResponse;  // SetPublishingMode, SetMonitoringMode,
                                                // DeleteMonitoredItems, DeleteSubscriptions
extern const StructType CreateMonitoredItemsRequest;
extern const StructType CreateMonitoredItemsResponse;
extern const StructType DeleteMonitoredItemsRequest;
extern const StructType SetMonitoringModeRequest;
extern const StructType DeleteSubscriptionsRequest;
extern const StructType PublishRequest;
extern const StructType PublishResponse;
extern const StructType DataChangeNotification;
extern const StructType StatusChangeNotification;
extern const StructType AnonymousIdentityToken;
}  // namespace msg

// Binary encoding ids of the response messages (the request's own are in its description).
namespace id {
constexpr uint32_t ServiceFault = 397;
constexpr uint32_t OpenSecureChannelResponse = 449;
constexpr uint32_t CreateSessionResponse = 464;
constexpr uint32_t ActivateSessionResponse = 470;
constexpr uint32_t CloseSessionResponse = 476;
constexpr uint32_t ReadResponse = 634;
constexpr uint32_t WriteResponse = 676;
constexpr uint32_t CreateSubscriptionResponse = 790;
constexpr uint32_t SetPublishingModeResponse = 802;
constexpr uint32_t CreateMonitoredItemsResponse = 754;
constexpr uint32_t SetMonitoringModeResponse = 772;
constexpr uint32_t DeleteMonitoredItemsResponse = 784;
constexpr uint32_t PublishResponse = 829;
constexpr uint32_t DeleteSubscriptionsResponse = 850;
constexpr uint32_t DataChangeNotification = 811;
constexpr uint32_t StatusChangeNotification = 820;
}  // namespace id

// Attribute ids read by this client.
namespace attr {
constexpr uint32_t NodeClass = 2;
constexpr uint32_t Value = 13;
constexpr uint32_t DataType = 14;
constexpr uint32_t AccessLevel = 17;
constexpr uint32_t UserAccessLevel = 18;
}  // namespace attr

// The status codes this client acts on or names.
namespace status {
constexpr uint32_t Good = 0;
constexpr uint32_t BadTimeout = 0x800A0000;
constexpr uint32_t BadCommunicationError = 0x80050000;
constexpr uint32_t BadUserAccessDenied = 0x801F0000;
constexpr uint32_t BadSessionIdInvalid = 0x80250000;
constexpr uint32_t BadSessionClosed = 0x80260000;
constexpr uint32_t BadSubscriptionIdInvalid = 0x80280000;
constexpr uint32_t BadNoCommunication = 0x80310000;
constexpr uint32_t BadWaitingForInitialData = 0x80320000;
constexpr uint32_t BadNodeIdInvalid = 0x80330000;
constexpr uint32_t BadNodeIdUnknown = 0x80340000;
constexpr uint32_t BadNotWritable = 0x803B0000;
constexpr uint32_t BadOutOfRange = 0x803C0000;
constexpr uint32_t BadSecurityPolicyRejected = 0x80550000;
constexpr uint32_t BadTypeMismatch = 0x80740000;
constexpr uint32_t BadTooManyPublishRequests = 0x80780000;
constexpr uint32_t BadNoSubscription = 0x80790000;
constexpr uint32_t BadSecureChannelClosed = 0x80860000;
constexpr uint32_t BadConfigurationError = 0x80890000;
constexpr uint32_t BadNotConnected = 0x808A0000;
constexpr uint32_t BadOutOfService = 0x808D0000;
constexpr uint32_t BadServerNotConnected = 0x800D0000;
}  // namespace status

// The symbolic name of a status code ("BadNodeIdUnknown"), or its number in hexadecimal
// ("0x80AB0000") for one this client does not know.
std::string StatusName(uint32_t code);
inline bool IsBad(uint32_t code) {
    return (code & 0x80000000u) != 0;
}

// Where a response's own values start, after its header's (whose string table has a
// length of its own).
inline size_t AfterHeader(const std::vector<Value>& v) {
    return v.size() > 4 ? 6 + v[4].count : v.size();
}

// A request header's values: the session's token, the time, the request handle, the
// time-out hint.
void AppendRequestHeader(std::vector<Value>& values, const NodeId& token, int64_t ticks,
                         uint32_t handle, uint32_t timeoutMs);

}  // namespace maroset::platform::opcua
