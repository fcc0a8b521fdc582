// Whatever an OPC UA server sends, the client's chunk reassembly and message decoders either
// decode it or fail with DecodeError: never a crash, a read past the message or an
// allocation larger than the message could describe. The input is a byte stream split at
// the points its first byte picks; every reassembled message body is decoded as each
// response and notification the client knows, and as a Variant and a DataValue.
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "platform/opcua/UaChunks.h"
#include "platform/opcua/UaCodec.h"
#include "platform/opcua/UaServices.h"

namespace {

using namespace maroset::platform::opcua;

const StructType* const Responses[] = {
    &msg::ServiceFault,
    &msg::OpenSecureChannelResponse,
    &msg::CreateSessionResponse,
    &msg::ActivateSessionResponse,
    &msg::ReadResponse,
    &msg::WriteResponse,
    &msg::CreateSubscriptionResponse,
    &msg::StatusResultsResponse,
    &msg::CreateMonitoredItemsResponse,
    &msg::PublishResponse,
    &msg::DataChangeNotification,
    &msg::StatusChangeNotification,
};

void decodeAll(std::string_view body, std::vector<Value>& values) {
    for (const StructType* type : Responses) {
        try {
            Reader r(body);
            NodeId typeId;
            r.nodeId(typeId);
            Decode(r, *type, values);
        } catch (const DecodeError&) {
        }
        try {
            Reader r(body);
            Decode(r, *type, values);
        } catch (const DecodeError&) {
        }
    }
    try {
        Reader r(body);
        DataValue d;
        DecodeVariant(r, d);
        DecodeDataValue(r, d);
    } catch (const DecodeError&) {
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const size_t step = 1 + data[0] % 64;
    const std::string_view stream(reinterpret_cast<const char*>(data) + 1, size - 1);
    UaChunkAssembler assembler;
    assembler.setLimits({8192, 1 << 20, 64});
    std::vector<Value> values;
    try {
        for (size_t at = 0; at < stream.size(); at += step) {
            assembler.feed(stream.substr(at, step),
                           [&](const UaMessage& m) { decodeAll(m.body, values); });
        }
    } catch (const DecodeError&) {
    }
    // The whole input as one message body too, so the decoders see inputs no chunk header
    // has to survive first.
    decodeAll(stream, values);
    return 0;
}
