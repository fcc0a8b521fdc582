#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>

#include "platform/opcua/UaBinary.h"

namespace maroset::platform::opcua {

// One message of the UA TCP connection, reassembled from its chunks.
struct UaMessage {
    // "ACK", "ERR", "OPN", "MSG" or "CLO".
    char type[4] = {};
    // Set for an abort chunk: the sender gave up on the message; status and reason say why.
    bool aborted = false;
    uint32_t channelId = 0;
    uint32_t requestId = 0;
    uint32_t status = 0;  // ERR and abort chunks
    // The body after the headers (the message's type id first, for OPN and MSG), or the
    // payload of ACK and ERR.
    std::string_view body;
};

// Splits the byte stream of a UA TCP connection into chunks and reassembles the chunks of
// each message, within the sizes negotiated by HEL/ACK: a chunk larger than the receive
// buffer, a message larger than the largest message, more chunks than allowed or a header
// that makes no sense fail with DecodeError, and the connection is given up. Stepped one
// arrival at a time: feed() may get any split of the stream, a byte at a time included.
class UaChunkAssembler {
  public:
    struct Limits {
        uint32_t receiveBufferSize = 65536;
        uint32_t maxMessageSize = 16 * 1024 * 1024;
        uint32_t maxChunkCount = 4096;
    };

    void setLimits(const Limits& limits) { limits_ = limits; }
    const Limits& limits() const { return limits_; }
    // Forgets everything (a new connection).
    void reset();

    // Takes the next bytes of the stream; deliver is called for each complete message, in
    // order. The message's body is valid during the call only.
    void feed(std::string_view bytes, const std::function<void(const UaMessage&)>& deliver);

  private:
    void chunk(std::string_view chunk, const std::function<void(const UaMessage&)>& deliver);

    struct Partial {
        std::string body;
        uint32_t chunks = 0;
    };
    Limits limits_;
    std::string pending_;                  // bytes of an incomplete chunk
    std::map<uint32_t, Partial> partial_;  // by request id
    uint64_t generation_ = 0;              // counts resets
};

// The security policy this client speaks: no signing, no encryption.
inline constexpr std::string_view SecurityPolicyNone =
    "http://opcfoundation.org/UA/SecurityPolicy#None";

// Appends a message as chunks of at most chunkSize bytes each: type "OPN" (with the
// asymmetric security header of policy None), "MSG" or "CLO" (with the token id), one
// sequence number per chunk, counted on from `sequence`.
void WriteChunks(std::string& out, std::string_view type, uint32_t channelId, uint32_t tokenId,
                 uint32_t& sequence, uint32_t requestId, std::string_view body, uint32_t chunkSize);

}  // namespace maroset::platform::opcua
