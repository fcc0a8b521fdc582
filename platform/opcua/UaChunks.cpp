#include "platform/opcua/UaChunks.h"

#include <algorithm>

namespace maroset::platform::opcua {

namespace {

constexpr size_t HeaderSize = 8;       // type, chunk type, size
constexpr uint32_t SmallestChunk = 8;  // what the header alone takes

bool isType(std::string_view t, const char* name) {
    return t.substr(0, 3) == std::string_view(name, 3);
}

}  // namespace

void UaChunkAssembler::reset() {
    pending_.clear();
    partial_.clear();
    ++generation_;
}

void UaChunkAssembler::feed(std::string_view bytes,
                            const std::function<void(const UaMessage&)>& deliver) {
    // Whole chunks straight from the arrival; only a tail that is not complete is kept, and
    // a chunk trickling in is appended to, never copied again, however it is split.
    const bool buffered = !pending_.empty();
    if (buffered) {
        pending_.append(bytes);
        bytes = pending_;
    }
    // A handler may reset the assembler (the connection is given up): the rest is dropped.
    const uint64_t generation = generation_;
    size_t at = 0;
    while (bytes.size() - at >= HeaderSize) {
        Reader r(bytes.substr(at + 4, 4));
        const uint32_t size = r.u32();
        if (size < SmallestChunk || size > limits_.receiveBufferSize)
            throw DecodeError("chunk size outside the negotiated limits");
        if (bytes.size() - at < size) break;
        chunk(bytes.substr(at, size), deliver);
        if (generation != generation_) return;
        at += size;
    }
    if (buffered) {
        pending_.erase(0, at);
    } else {
        pending_.assign(bytes.substr(at));
    }
}

void UaChunkAssembler::chunk(std::string_view c,
                             const std::function<void(const UaMessage&)>& deliver) {
    UaMessage m;
    std::copy_n(c.data(), 3, m.type);
    const char final = c[3];
    Reader r(c.substr(HeaderSize));
    if (isType(c, "ACK") || isType(c, "ERR")) {
        if (final != 'F') throw DecodeError("ACK and ERR come in one chunk");
        if (isType(c, "ERR")) m.status = Reader(c.substr(HeaderSize)).u32();
        m.body = c.substr(HeaderSize);
        deliver(m);
        return;
    }
    const bool opn = isType(c, "OPN");
    if (!opn && !isType(c, "MSG") && !isType(c, "CLO")) throw DecodeError("unknown message type");
    if (final != 'F' && final != 'C' && final != 'A') throw DecodeError("unknown chunk type");
    m.channelId = r.u32();
    if (opn) {
        (void)r.bytes();  // security policy
        (void)r.bytes();  // sender certificate
        (void)r.bytes();  // receiver thumbprint
    } else {
        (void)r.u32();  // token id
    }
    (void)r.u32();  // sequence number: TCP keeps the order, and nothing is signed
    m.requestId = r.u32();
    const std::string_view part(r.position(), r.left());
    if (final == 'A') {
        partial_.erase(m.requestId);
        Reader a(part);
        m.aborted = true;
        m.status = a.u32();
        deliver(m);
        return;
    }
    auto it = partial_.find(m.requestId);
    if (final == 'F' && it == partial_.end()) {
        // The common case: a message in one chunk is delivered without a copy.
        if (part.size() > limits_.maxMessageSize) throw DecodeError("message too large");
        m.body = part;
        deliver(m);
        return;
    }
    if (it == partial_.end()) it = partial_.emplace(m.requestId, Partial{}).first;
    Partial& p = it->second;
    if (p.body.size() + part.size() > limits_.maxMessageSize ||
        (limits_.maxChunkCount && ++p.chunks > limits_.maxChunkCount)) {
        partial_.erase(it);
        throw DecodeError("message too large");
    }
    p.body.append(part);
    if (final == 'C') return;
    const std::string body = std::move(p.body);
    partial_.erase(it);
    m.body = body;
    deliver(m);
}

void WriteChunks(std::string& out, std::string_view type, uint32_t channelId, uint32_t tokenId,
                 uint32_t& sequence, uint32_t requestId, std::string_view body,
                 uint32_t chunkSize) {
    const bool opn = type == "OPN";
    const size_t security = opn ? 4 + SecurityPolicyNone.size() + 4 + 4 : 4;
    const size_t overhead = HeaderSize + 4 + security + 8;
    const size_t room = chunkSize > overhead + 1 ? chunkSize - overhead : 1;
    Writer w(out);
    size_t at = 0;
    do {
        const size_t n = std::min(room, body.size() - at);
        const bool last = at + n == body.size();
        out.append(type);
        w.u8(static_cast<uint8_t>(last ? 'F' : 'C'));
        w.u32(static_cast<uint32_t>(overhead + n));
        w.u32(channelId);
        if (opn) {
            w.bytes(SecurityPolicyNone);
            w.bytes({}, true);
            w.bytes({}, true);
        } else {
            w.u32(tokenId);
        }
        w.u32(sequence++);
        w.u32(requestId);
        out.append(body.substr(at, n));
        at += n;
    } while (at < body.size());
}

}  // namespace maroset::platform::opcua
