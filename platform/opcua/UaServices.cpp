#include "platform/opcua/UaServices.h"

#include <cstdio>

namespace maroset::platform::opcua {

namespace {

using B = BuiltIn;

constexpr Field one(B t) {
    return Field{t, false, nullptr};
}
constexpr Field many(B t) {
    return Field{t, true, nullptr};
}
constexpr Field one(const StructType& s) {
    return Field{B::Null, false, &s};
}
constexpr Field many(const StructType& s) {
    return Field{B::Null, true, &s};
}

// Enumerations travel as Int32.
constexpr B Enum = B::Int32;

}  // namespace

namespace msg {

namespace {
const Field requestHeader[] = {one(B::NodeId),         one(B::DateTime), one(B::UInt32),
                               one(B::UInt32),         one(B::String),   one(B::UInt32),
                               one(B::ExtensionObject)};
const Field responseHeader[] = {one(B::DateTime),       one(B::UInt32),  one(B::StatusCode),
                                one(B::DiagnosticInfo), many(B::String), one(B::ExtensionObject)};
}  // namespace
const StructType RequestHeader{"RequestHeader", 0, requestHeader};
const StructType ResponseHeader{"ResponseHeader", 0, responseHeader};

namespace {
const Field serviceFault[] = {one(ResponseHeader)};
const Field channelSecurityToken[] = {one(B::UInt32), one(B::UInt32), one(B::DateTime),
                                      one(B::UInt32)};
const StructType ChannelSecurityToken{"ChannelSecurityToken", 0, channelSecurityToken};
// header, clientProtocolVersion, requestType, securityMode, clientNonce, requestedLifetime
const Field openRequest[] = {one(RequestHeader), one(B::UInt32),     one(Enum),
                             one(Enum),          one(B::ByteString), one(B::UInt32)};
// header, serverProtocolVersion, securityToken, serverNonce
const Field openResponse[] = {one(ResponseHeader), one(B::UInt32), one(ChannelSecurityToken),
                              one(B::ByteString)};
const Field closeChannel[] = {one(RequestHeader)};

// applicationUri, productUri, applicationName, applicationType, gatewayServerUri,
// discoveryProfileUri, discoveryUrls
const Field applicationDescription[] = {one(B::String), one(B::String), one(B::LocalizedText),
                                        one(Enum),      one(B::String), one(B::String),
                                        many(B::String)};
const StructType ApplicationDescription{"ApplicationDescription", 0, applicationDescription};
// policyId, tokenType, issuedTokenType, issuerEndpointUrl, securityPolicyUri
const Field userTokenPolicy[] = {one(B::String), one(Enum), one(B::String), one(B::String),
                                 one(B::String)};
const StructType UserTokenPolicy{"UserTokenPolicy", 0, userTokenPolicy};
// endpointUrl, server, serverCertificate, securityMode, securityPolicyUri, userIdentityTokens,
// transportProfileUri, securityLevel
const Field endpointDescription[] = {
    one(B::String), one(ApplicationDescription), one(B::ByteString), one(Enum),
    one(B::String), many(UserTokenPolicy),       one(B::String),     one(B::Byte)};
const StructType EndpointDescription{"EndpointDescription", 0, endpointDescription};
const Field signedSoftwareCertificate[] = {one(B::ByteString), one(B::ByteString)};
const StructType SignedSoftwareCertificate{"SignedSoftwareCertificate", 0,
                                           signedSoftwareCertificate};
const Field signatureData[] = {one(B::String), one(B::ByteString)};
const StructType SignatureData{"SignatureData", 0, signatureData};

// header, clientDescription, serverUri, endpointUrl, sessionName, clientNonce,
// clientCertificate, requestedSessionTimeout, maxResponseMessageSize
const Field createSessionRequest[] = {
    one(RequestHeader), one(ApplicationDescription), one(B::String), one(B::String), one(B::String),
    one(B::ByteString), one(B::ByteString),          one(B::Double), one(B::UInt32)};
// header, sessionId, authenticationToken, revisedSessionTimeout, serverNonce,
// serverCertificate, serverEndpoints, serverSoftwareCertificates, serverSignature,
// maxRequestMessageSize
const Field createSessionResponse[] = {one(ResponseHeader),
                                       one(B::NodeId),
                                       one(B::NodeId),
                                       one(B::Double),
                                       one(B::ByteString),
                                       one(B::ByteString),
                                       many(EndpointDescription),
                                       many(SignedSoftwareCertificate),
                                       one(SignatureData),
                                       one(B::UInt32)};
// header, clientSignature, clientSoftwareCertificates, localeIds, userIdentityToken,
// userTokenSignature
const Field activateSessionRequest[] = {
    one(RequestHeader), one(SignatureData),      many(SignedSoftwareCertificate),
    many(B::String),    one(B::ExtensionObject), one(SignatureData)};
// header, serverNonce, results, diagnosticInfos
const Field activateSessionResponse[] = {one(ResponseHeader), one(B::ByteString),
                                         many(B::StatusCode), many(B::DiagnosticInfo)};
// header, deleteSubscriptions
const Field closeSessionRequest[] = {one(RequestHeader), one(B::Boolean)};

// nodeId, attributeId, indexRange, dataEncoding
const Field readValueId[] = {one(B::NodeId), one(B::UInt32), one(B::String), one(B::QualifiedName)};
const StructType ReadValueId{"ReadValueId", 0, readValueId};
// header, maxAge, timestampsToReturn, nodesToRead
const Field readRequest[] = {one(RequestHeader), one(B::Double), one(Enum), many(ReadValueId)};
const Field readResponse[] = {one(ResponseHeader), many(B::DataValue), many(B::DiagnosticInfo)};
// nodeId, attributeId, indexRange, value
const Field writeValue[] = {one(B::NodeId), one(B::UInt32), one(B::String), one(B::DataValue)};
const StructType WriteValue{"WriteValue", 0, writeValue};
const Field writeRequest[] = {one(RequestHeader), many(WriteValue)};
const Field statusResults[] = {one(ResponseHeader), many(B::StatusCode), many(B::DiagnosticInfo)};

// header, requestedPublishingInterval, requestedLifetimeCount, requestedMaxKeepAliveCount,
// maxNotificationsPerPublish, publishingEnabled, priority
const Field createSubscriptionRequest[] = {one(RequestHeader), one(B::Double), one(B::UInt32),
                                           one(B::UInt32),     one(B::UInt32), one(B::Boolean),
                                           one(B::Byte)};
// header, subscriptionId, revisedPublishingInterval, revisedLifetimeCount,
// revisedMaxKeepAliveCount
const Field createSubscriptionResponse[] = {one(ResponseHeader), one(B::UInt32), one(B::Double),
                                            one(B::UInt32), one(B::UInt32)};
// header, publishingEnabled, subscriptionIds
const Field setPublishingModeRequest[] = {one(RequestHeader), one(B::Boolean), many(B::UInt32)};

// clientHandle, samplingInterval, filter, queueSize, discardOldest
const Field monitoringParameters[] = {one(B::UInt32), one(B::Double), one(B::ExtensionObject),
                                      one(B::UInt32), one(B::Boolean)};
const StructType MonitoringParameters{"MonitoringParameters", 0, monitoringParameters};
// itemToMonitor, monitoringMode, requestedParameters
const Field monitoredItemCreateRequest[] = {one(ReadValueId), one(Enum), one(MonitoringParameters)};
const StructType MonitoredItemCreateRequest{"MonitoredItemCreateRequest", 0,
                                            monitoredItemCreateRequest};
// header, subscriptionId, timestampsToReturn, itemsToCreate
const Field createMonitoredItemsRequest[] = {one(RequestHeader), one(B::UInt32), one(Enum),
                                             many(MonitoredItemCreateRequest)};
// statusCode, monitoredItemId, revisedSamplingInterval, revisedQueueSize, filterResult
const Field monitoredItemCreateResult[] = {one(B::StatusCode), one(B::UInt32), one(B::Double),
                                           one(B::UInt32), one(B::ExtensionObject)};
const StructType MonitoredItemCreateResult{"MonitoredItemCreateResult", 0,
                                           monitoredItemCreateResult};
const Field createMonitoredItemsResponse[] = {one(ResponseHeader), many(MonitoredItemCreateResult),
                                              many(B::DiagnosticInfo)};
// header, subscriptionId, monitoredItemIds
const Field deleteMonitoredItemsRequest[] = {one(RequestHeader), one(B::UInt32), many(B::UInt32)};
// header, subscriptionId, monitoringMode, monitoredItemIds
const Field setMonitoringModeRequest[] = {one(RequestHeader), one(B::UInt32), one(Enum),
                                          many(B::UInt32)};
const Field deleteSubscriptionsRequest[] = {one(RequestHeader), many(B::UInt32)};

// subscriptionId, sequenceNumber
const Field subscriptionAcknowledgement[] = {one(B::UInt32), one(B::UInt32)};
const StructType SubscriptionAcknowledgement{"SubscriptionAcknowledgement", 0,
                                             subscriptionAcknowledgement};
const Field publishRequest[] = {one(RequestHeader), many(SubscriptionAcknowledgement)};
// sequenceNumber, publishTime, notificationData
const Field notificationMessage[] = {one(B::UInt32), one(B::DateTime), many(B::ExtensionObject)};
const StructType NotificationMessage{"NotificationMessage", 0, notificationMessage};
// header, subscriptionId, availableSequenceNumbers, moreNotifications, notificationMessage,
// results, diagnosticInfos
const Field publishResponse[] = {
    one(ResponseHeader),      one(B::UInt32),      many(B::UInt32),        one(B::Boolean),
    one(NotificationMessage), many(B::StatusCode), many(B::DiagnosticInfo)};
// clientHandle, value
const Field monitoredItemNotification[] = {one(B::UInt32), one(B::DataValue)};
const StructType MonitoredItemNotification{"MonitoredItemNotification", 0,
                                           monitoredItemNotification};
const Field dataChangeNotification[] = {many(MonitoredItemNotification), many(B::DiagnosticInfo)};
const Field statusChangeNotification[] = {one(B::StatusCode), one(B::DiagnosticInfo)};
const Field anonymousIdentityToken[] = {one(B::String)};
}  // namespace

const StructType ServiceFault{"ServiceFault", id::ServiceFault, serviceFault};
const StructType OpenSecureChannelRequest{"OpenSecureChannelRequest", 446, openRequest};
const StructType OpenSecureChannelResponse{"OpenSecureChannelResponse",
                                           id::OpenSecureChannelResponse, openResponse};
const StructType CloseSecureChannelRequest{"CloseSecureChannelRequest", 452, closeChannel};
const StructType CreateSessionRequest{"CreateSessionRequest", 461, createSessionRequest};
const StructType CreateSessionResponse{"CreateSessionResponse", id::CreateSessionResponse,
                                       createSessionResponse};
const StructType ActivateSessionRequest{"ActivateSessionRequest", 467, activateSessionRequest};
const StructType ActivateSessionResponse{"ActivateSessionResponse", id::ActivateSessionResponse,
                                         activateSessionResponse};
const StructType CloseSessionRequest{"CloseSessionRequest", 473, closeSessionRequest};
const StructType ReadRequest{"ReadRequest", 631, readRequest};
const StructType ReadResponse{"ReadResponse", id::ReadResponse, readResponse};
const StructType WriteRequest{"WriteRequest", 673, writeRequest};
const StructType WriteResponse{"WriteResponse", id::WriteResponse, statusResults};
const StructType CreateSubscriptionRequest{"CreateSubscriptionRequest", 787,
                                           createSubscriptionRequest};
const StructType CreateSubscriptionResponse{
    "CreateSubscriptionResponse", id::CreateSubscriptionResponse, createSubscriptionResponse};
const StructType SetPublishingModeRequest{"SetPublishingModeRequest", 799,
                                          setPublishingModeRequest};
const StructType StatusResultsResponse{"StatusResultsResponse", 0, statusResults};
const StructType CreateMonitoredItemsRequest{"CreateMonitoredItemsRequest", 751,
                                             createMonitoredItemsRequest};
const StructType CreateMonitoredItemsResponse{
    "CreateMonitoredItemsResponse", id::CreateMonitoredItemsResponse, createMonitoredItemsResponse};
const StructType DeleteMonitoredItemsRequest{"DeleteMonitoredItemsRequest", 781,
                                             deleteMonitoredItemsRequest};
const StructType SetMonitoringModeRequest{"SetMonitoringModeRequest", 769,
                                          setMonitoringModeRequest};
const StructType DeleteSubscriptionsRequest{"DeleteSubscriptionsRequest", 847,
                                            deleteSubscriptionsRequest};
const StructType PublishRequest{"PublishRequest", 826, publishRequest};
const StructType PublishResponse{"PublishResponse", id::PublishResponse, publishResponse};
const StructType DataChangeNotification{"DataChangeNotification", id::DataChangeNotification,
                                        dataChangeNotification};
const StructType StatusChangeNotification{"StatusChangeNotification", id::StatusChangeNotification,
                                          statusChangeNotification};
const StructType AnonymousIdentityToken{"AnonymousIdentityToken", 321, anonymousIdentityToken};

}  // namespace msg

std::string StatusName(uint32_t code) {
    static constexpr std::pair<uint32_t, const char*> names[] = {
        {0x00000000, "Good"},
        {0x80010000, "BadUnexpectedError"},
        {0x80020000, "BadInternalError"},
        {0x80040000, "BadResourceUnavailable"},
        {0x80050000, "BadCommunicationError"},
        {0x80060000, "BadEncodingError"},
        {0x80070000, "BadDecodingError"},
        {0x80080000, "BadEncodingLimitsExceeded"},
        {0x800A0000, "BadTimeout"},
        {0x800B0000, "BadServiceUnsupported"},
        {0x800C0000, "BadShutdown"},
        {0x800D0000, "BadServerNotConnected"},
        {0x800E0000, "BadServerHalted"},
        {0x800F0000, "BadNothingToDo"},
        {0x80100000, "BadTooManyOperations"},
        {0x801F0000, "BadUserAccessDenied"},
        {0x80200000, "BadIdentityTokenInvalid"},
        {0x80210000, "BadIdentityTokenRejected"},
        {0x80220000, "BadSecureChannelIdInvalid"},
        {0x80250000, "BadSessionIdInvalid"},
        {0x80260000, "BadSessionClosed"},
        {0x80270000, "BadSessionNotActivated"},
        {0x80280000, "BadSubscriptionIdInvalid"},
        {0x80310000, "BadNoCommunication"},
        {0x80320000, "BadWaitingForInitialData"},
        {0x80330000, "BadNodeIdInvalid"},
        {0x80340000, "BadNodeIdUnknown"},
        {0x80350000, "BadAttributeIdInvalid"},
        {0x80360000, "BadIndexRangeInvalid"},
        {0x803A0000, "BadNotReadable"},
        {0x803B0000, "BadNotWritable"},
        {0x803C0000, "BadOutOfRange"},
        {0x80420000, "BadMonitoredItemIdInvalid"},
        {0x80550000, "BadSecurityPolicyRejected"},
        {0x80730000, "BadWriteNotSupported"},
        {0x80740000, "BadTypeMismatch"},
        {0x80780000, "BadTooManyPublishRequests"},
        {0x80790000, "BadNoSubscription"},
        {0x807A0000, "BadSequenceNumberUnknown"},
        {0x807D0000, "BadTcpServerTooBusy"},
        {0x807E0000, "BadTcpMessageTypeInvalid"},
        {0x807F0000, "BadTcpSecureChannelUnknown"},
        {0x80800000, "BadTcpMessageTooLarge"},
        {0x80820000, "BadTcpInternalError"},
        {0x80830000, "BadTcpEndpointUrlInvalid"},
        {0x80850000, "BadRequestTimeout"},
        {0x80860000, "BadSecureChannelClosed"},
        {0x80870000, "BadSecureChannelTokenUnknown"},
        {0x80890000, "BadConfigurationError"},
        {0x808A0000, "BadNotConnected"},
        {0x808D0000, "BadOutOfService"},
        {0x809B0000, "BadNoData"},
        {0x809E0000, "BadDataUnavailable"},
        {0x80B70000, "BadMaxConnectionsReached"},
        {0x80BE0000, "BadProtocolVersionUnsupported"},
        {0x80EE0000, "BadServerTooBusy"},
    };
    // The low 16 bits are flags (info bits, overflow): the name is the code's.
    const uint32_t key = code & 0xFFFF0000u;
    for (const auto& [value, name] : names) {
        if (value == key) return name;
    }
    char buf[16];
    std::snprintf(buf, sizeof buf, "0x%08X", code);
    return buf;
}

void AppendRequestHeader(std::vector<Value>& values, const NodeId& token, int64_t ticks,
                         uint32_t handle, uint32_t timeoutMs) {
    Value& t = values.emplace_back();
    t.node = token;
    values.emplace_back().number = static_cast<uint64_t>(ticks);
    values.emplace_back().number = handle;
    values.emplace_back();              // returnDiagnostics: none
    values.emplace_back().null = true;  // auditEntryId
    values.emplace_back().number = timeoutMs;
    values.emplace_back();  // additionalHeader: none
}

}  // namespace maroset::platform::opcua
