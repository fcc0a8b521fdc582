#include "platform/mbt/MbtLibrary.h"

#include <arpa/inet.h>
#include <modbus.h>

#include <algorithm>
#include <array>
#include <cerrno>

namespace maroset::platform {

namespace {

// Modbus limits per request (Modbus application protocol).
constexpr uint16_t kMaxReadWords = 125;
constexpr uint16_t kMaxReadBits = 2000;
constexpr uint16_t kMaxWriteWords = 123;
constexpr uint16_t kMaxWriteBits = 1968;

constexpr uint8_t kInputRegisters = 3;
constexpr uint8_t kHoldingRegisters = 4;
constexpr uint8_t kDiscreteInputs = 1;
constexpr uint8_t kCoils = 0;

constexpr uint8_t kReadExceptionStatus = 0x07;
constexpr int kMbapLength = 7;  // transaction, protocol, length, unit

bool isIpv4(const std::string& text) {
    in_addr addr{};
    return inet_pton(AF_INET, text.c_str(), &addr) == 1;
}

size_t bytesForBits(uint16_t bits) {
    return (static_cast<size_t>(bits) + 7) / 8;
}

}  // namespace

struct MbtLibrary::Connection {
    explicit Connection(modbus_t* c) : ctx(c) {}
    ~Connection() {
        modbus_close(ctx);
        modbus_free(ctx);
    }
    Connection(const Connection&) = delete;
    Connection& operator=(const Connection&) = delete;

    modbus_t* ctx;
    bool closed = false;
};

MbtLibrary::MbtLibrary(PortMap portMap) : portMap_(std::move(portMap)) {}

MbtLibrary::~MbtLibrary() = default;

int32_t MbtLibrary::refuse(int32_t status) {
    lastError_ = mbt::StatusText(status);
    return status;
}

int32_t MbtLibrary::MBTInit() {
    ++initCount_;
    return mbt::Ok;
}

int32_t MbtLibrary::MBTExit() {
    if (initCount_ == 0) return refuse(mbt::NotInitialised);
    --initCount_;
    return mbt::Ok;
}

int32_t MbtLibrary::MBTConnect(const std::string& hostAddress, uint16_t port, int32_t protocol,
                               uint32_t requestTimeout, Handle& hSocket) {
    hSocket = 0;
    if (initCount_ == 0) return refuse(mbt::NotInitialised);
    if (protocol != 0) return refuse(mbt::NotSupported);
    // A host name would need a resolver that can block without bound: addresses only.
    if (requestTimeout == 0 || !isIpv4(hostAddress)) return refuse(mbt::InvalidArgument);

    const uint16_t target = portMap_ ? portMap_(port) : port;
    modbus_t* ctx = modbus_new_tcp(hostAddress.c_str(), target);
    if (!ctx) {
        lastError_ = modbus_strerror(errno);
        return mbt::LinkError;
    }
    auto connection = std::make_unique<Connection>(ctx);
    modbus_set_response_timeout(ctx, requestTimeout / 1000, (requestTimeout % 1000) * 1000);
    // No separate time between bytes: the whole reply must be in within the request time-out.
    modbus_set_byte_timeout(ctx, 0, 0);
    modbus_set_error_recovery(ctx, MODBUS_ERROR_RECOVERY_NONE);

    errno = 0;
    if (modbus_connect(ctx) == -1) {
        // A connect that runs out of time leaves errno as the pending connect set it.
        const int error = (errno == 0 || errno == EINPROGRESS) ? ETIMEDOUT : errno;
        lastError_ = modbus_strerror(error);
        return mbt::ConnectFailed;
    }
    const Handle handle = nextHandle_++;
    if (nextHandle_ <= 0) nextHandle_ = 1;
    connections_.emplace(handle, std::move(connection));
    hSocket = handle;
    return mbt::Ok;
}

int32_t MbtLibrary::MBTDisconnect(Handle hSocket) {
    const auto it = connections_.find(hSocket);
    if (it == connections_.end()) return refuse(mbt::InvalidHandle);
    connections_.erase(it);
    return mbt::Ok;
}

int32_t MbtLibrary::usable(Handle hSocket, Connection*& connection) {
    const auto it = connections_.find(hSocket);
    if (it == connections_.end()) return refuse(mbt::InvalidHandle);
    if (it->second->closed) return refuse(mbt::ConnectionClosed);
    connection = it->second.get();
    return mbt::Ok;
}

int32_t MbtLibrary::failed(Connection& connection, int error) {
    lastError_ = modbus_strerror(error);
    if (error > MODBUS_ENOBASE && error < MODBUS_ENOBASE + MODBUS_EXCEPTION_MAX)
        return error - MODBUS_ENOBASE;  // an exception reply: the link is in step

    // Anything else may leave bytes of this exchange still to come: never read them as the
    // answer to a later request.
    modbus_close(connection.ctx);
    connection.closed = true;
    switch (error) {
        case ETIMEDOUT:
            return mbt::Timeout;
        case ECONNRESET:
        case ECONNREFUSED:
        case ECONNABORTED:
        case EPIPE:
        case ENOTCONN:
        case EBADF:
            return mbt::ConnectionClosed;
        case EMBBADDATA:
        case EMBBADEXC:
        case EMBUNKEXC:
        case EMBMDATA:
        case EMBBADCRC:
        case EMBBADSLAVE:
            return mbt::BadReply;
        default:
            return mbt::LinkError;
    }
}

int32_t MbtLibrary::MBTReadExceptionStatus(Handle hSocket, uint8_t& exceptionStatus,
                                           MBTReadCompleted callback, uint32_t) {
    if (callback) return refuse(mbt::NotSupported);
    Connection* c = nullptr;
    if (const int32_t status = usable(hSocket, c)) return status;

    // libmodbus has no call for function 07: the request goes raw, the reply is checked here.
    const uint8_t request[] = {MODBUS_TCP_SLAVE, kReadExceptionStatus};
    errno = 0;
    if (modbus_send_raw_request(c->ctx, request, sizeof request) == -1) return failed(*c, errno);
    std::array<uint8_t, MODBUS_TCP_MAX_ADU_LENGTH> reply{};  // read past a short reply: zeros
    errno = 0;
    const int length = modbus_receive_confirmation(c->ctx, reply.data());
    if (length == -1) return failed(*c, errno);

    // MBAP header, then function and one byte: the status, or the exception code.
    const bool wellFormed = length == kMbapLength + 2 && reply[2] == 0 && reply[3] == 0 &&
                            reply[4] == 0 && reply[5] == 3;
    const uint8_t function = reply[kMbapLength];
    const uint8_t data = reply[kMbapLength + 1];
    if (wellFormed && function == kReadExceptionStatus) {
        exceptionStatus = data;
        return mbt::Ok;
    }
    if (wellFormed && function == (kReadExceptionStatus | 0x80))
        return failed(*c,
                      data > 0 && data < MODBUS_EXCEPTION_MAX ? MODBUS_ENOBASE + data : EMBBADEXC);
    return failed(*c, EMBBADDATA);
}

int32_t MbtLibrary::MBTReadRegisters(Handle hSocket, uint8_t tableType, uint16_t dataStartAddress,
                                     uint16_t numWords, std::span<uint8_t> readBuffer,
                                     MBTReadCompleted callback, uint32_t) {
    if (callback) return refuse(mbt::NotSupported);
    if ((tableType != kInputRegisters && tableType != kHoldingRegisters) || numWords == 0 ||
        numWords > kMaxReadWords || readBuffer.size() < 2u * numWords)
        return refuse(mbt::InvalidArgument);
    Connection* c = nullptr;
    if (const int32_t status = usable(hSocket, c)) return status;

    std::array<uint16_t, kMaxReadWords> words{};
    errno = 0;
    const int n =
        tableType == kInputRegisters
            ? modbus_read_input_registers(c->ctx, dataStartAddress, numWords, words.data())
            : modbus_read_registers(c->ctx, dataStartAddress, numWords, words.data());
    if (n == -1) return failed(*c, errno);
    for (uint16_t i = 0; i < numWords; ++i) {
        readBuffer[2 * i] = static_cast<uint8_t>(words[i] >> 8);
        readBuffer[2 * i + 1] = static_cast<uint8_t>(words[i] & 0xFF);
    }
    return mbt::Ok;
}

int32_t MbtLibrary::MBTReadCoils(Handle hSocket, uint8_t tableType, uint16_t dataStartAddress,
                                 uint16_t numBits, std::span<uint8_t> readBuffer,
                                 MBTReadCompleted callback, uint32_t) {
    if (callback) return refuse(mbt::NotSupported);
    if ((tableType != kDiscreteInputs && tableType != kCoils) || numBits == 0 ||
        numBits > kMaxReadBits || readBuffer.size() < bytesForBits(numBits))
        return refuse(mbt::InvalidArgument);
    Connection* c = nullptr;
    if (const int32_t status = usable(hSocket, c)) return status;

    std::array<uint8_t, kMaxReadBits> bits;  // one byte per bit, filled up to numBits
    errno = 0;
    const int n = tableType == kDiscreteInputs
                      ? modbus_read_input_bits(c->ctx, dataStartAddress, numBits, bits.data())
                      : modbus_read_bits(c->ctx, dataStartAddress, numBits, bits.data());
    if (n == -1) return failed(*c, errno);
    std::fill_n(readBuffer.begin(), bytesForBits(numBits), uint8_t{0});
    for (uint16_t i = 0; i < numBits; ++i) {
        if (bits[i]) readBuffer[i / 8] |= static_cast<uint8_t>(1u << (i % 8));
    }
    return mbt::Ok;
}

int32_t MbtLibrary::MBTWriteRegisters(Handle hSocket, uint16_t dataStartAddress, uint16_t numWords,
                                      std::span<const uint8_t> writeBuffer,
                                      MBTWriteCompleted callback, uint32_t) {
    if (callback) return refuse(mbt::NotSupported);
    if (numWords == 0 || numWords > kMaxWriteWords || writeBuffer.size() < 2u * numWords)
        return refuse(mbt::InvalidArgument);
    Connection* c = nullptr;
    if (const int32_t status = usable(hSocket, c)) return status;

    std::array<uint16_t, kMaxWriteWords> words;
    for (uint16_t i = 0; i < numWords; ++i)
        words[i] = static_cast<uint16_t>((writeBuffer[2 * i] << 8) | writeBuffer[2 * i + 1]);
    errno = 0;
    if (modbus_write_registers(c->ctx, dataStartAddress, numWords, words.data()) == -1)
        return failed(*c, errno);
    return mbt::Ok;
}

int32_t MbtLibrary::MBTWriteCoils(Handle hSocket, uint16_t dataStartAddress, uint16_t numBits,
                                  std::span<const uint8_t> writeBuffer, MBTWriteCompleted callback,
                                  uint32_t) {
    if (callback) return refuse(mbt::NotSupported);
    if (numBits == 0 || numBits > kMaxWriteBits || writeBuffer.size() < bytesForBits(numBits))
        return refuse(mbt::InvalidArgument);
    Connection* c = nullptr;
    if (const int32_t status = usable(hSocket, c)) return status;

    std::array<uint8_t, kMaxWriteBits> bits;
    for (uint16_t i = 0; i < numBits; ++i) bits[i] = (writeBuffer[i / 8] >> (i % 8)) & 1u;
    errno = 0;
    if (modbus_write_bits(c->ctx, dataStartAddress, numBits, bits.data()) == -1)
        return failed(*c, errno);
    return mbt::Ok;
}

}  // namespace maroset::platform
