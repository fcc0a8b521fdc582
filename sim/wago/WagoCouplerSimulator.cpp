#include "sim/wago/WagoCouplerSimulator.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <modbus.h>
#include <netinet/in.h>
#include <poll.h>
#include <pthread.h>
#include <signal.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <condition_variable>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <thread>
#include <utility>

namespace maroset::sim {

namespace {

using Clock = std::chrono::steady_clock;

constexpr size_t kLogLimit = 4096;
constexpr int kHeader = 7;  // MBAP header of Modbus/TCP

// Function codes (Modbus application protocol).
constexpr uint8_t kReadCoils = 0x01;
constexpr uint8_t kReadDiscreteInputs = 0x02;
constexpr uint8_t kReadHoldingRegisters = 0x03;
constexpr uint8_t kReadInputRegisters = 0x04;
constexpr uint8_t kWriteSingleCoil = 0x05;
constexpr uint8_t kWriteSingleRegister = 0x06;
constexpr uint8_t kReadExceptionStatus = 0x07;
constexpr uint8_t kWriteMultipleCoils = 0x0F;
constexpr uint8_t kWriteMultipleRegisters = 0x10;

// Where the coupler reads its outputs back.
constexpr int kWordReadBack = 512;
constexpr int kBitReadBack = 512;
constexpr int kHighBitsFrom = 4095;
constexpr int kHighBitReadBack = 4096;

uint16_t be16(const uint8_t* p) {
    return static_cast<uint16_t>((p[0] << 8) | p[1]);
}

void checkIndex(int index, int size) {
    if (index < 0 || index >= size) throw std::out_of_range("no such point in the process image");
}

// The output bit a coil read address shows, or -1.
int outputBitReadAt(int address) {
    if (address >= kBitReadBack && address < kBitReadBack + kHighBitsFrom)
        return address - kBitReadBack;
    if (address >= kHighBitsFrom + kHighBitReadBack &&
        address < WagoCouplerSimulator::OutputBits + kHighBitReadBack)
        return address - kHighBitReadBack;
    return -1;
}

bool inside(int address, int count, int from, int size) {
    return count >= 1 && address >= from && address + count <= from + size;
}

void sendAll(int fd, const uint8_t* data, size_t size) {
    // A peer that went away is no concern of the coupler's.
    while (size > 0) {
        const ssize_t n = ::send(fd, data, size, MSG_NOSIGNAL);
        if (n <= 0) return;
        data += n;
        size -= static_cast<size_t>(n);
    }
}

}  // namespace

struct WagoCouplerSimulator::Server {
    explicit Server(Options o) : options(o), port(o.port) {
        ctx = modbus_new_tcp("127.0.0.1", 0);
        mapping = modbus_mapping_new(0x10000, 0x10000, 0x10000, 0x10000);
        wake = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
        if (!ctx || !mapping || wake < 0) {
            release();
            throw std::runtime_error("the coupler simulator cannot start");
        }
        modbus_set_byte_timeout(ctx, 0, 100000);
        motion = o.motion;
        nextMotion = Clock::now() + options.motionPeriod;
    }
    ~Server() { release(); }

    void release() {
        if (mapping) modbus_mapping_free(mapping);
        if (ctx) modbus_free(ctx);
        if (wake >= 0) ::close(wake);
        mapping = nullptr;
        ctx = nullptr;
        wake = -1;
    }

    // --- the server thread ---------------------------------------------------------------

    void openListener() {
        const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (fd < 0) throw std::runtime_error(std::strerror(errno));
        const int on = 1;
        ::setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
        sockaddr_in addr{};
        addr.sin_family = AF_INET;
        addr.sin_port = htons(port);
        addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        if (::bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof addr) != 0 ||
            ::listen(fd, 16) != 0) {
            const std::string why = std::strerror(errno);
            ::close(fd);
            throw std::runtime_error("cannot listen on 127.0.0.1:" + std::to_string(port) + ": " +
                                     why);
        }
        socklen_t len = sizeof addr;
        ::getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &len);
        port = ntohs(addr.sin_port);
        listener = fd;
    }

    void closeListener() {
        if (listener >= 0) ::close(listener);
        listener = -1;
    }

    void closeClients() {
        for (const int fd : clients) ::close(fd);
        clients.clear();
        open = 0;
    }

    void run() {
        for (;;) {
            std::vector<pollfd> fds;
            int timeout = -1;
            {
                std::unique_lock lock(mutex);
                if (stopping) break;
                applyControl();
                if (motion) {
                    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
                        nextMotion - Clock::now());
                    timeout = static_cast<int>(std::max<int64_t>(0, left.count()));
                }
                // A listener that could not be had yet is tried again soon.
                if (!refusing && listener < 0) timeout = timeout < 0 ? 100 : std::min(timeout, 100);
            }
            fds.push_back({wake, POLLIN, 0});
            if (listener >= 0) fds.push_back({listener, POLLIN, 0});
            const size_t firstClient = fds.size();
            for (const int fd : clients) fds.push_back({fd, POLLIN, 0});
            if (::poll(fds.data(), fds.size(), timeout) < 0 && errno != EINTR) break;

            if (fds[0].revents) {
                uint64_t count;
                while (::read(wake, &count, sizeof count) > 0) {
                }
            }
            if (listener >= 0 && firstClient == 2 && (fds[1].revents & POLLIN)) accept();
            std::vector<int> gone;
            for (size_t i = firstClient; i < fds.size(); ++i) {
                if (fds[i].revents && !serve(fds[i].fd)) gone.push_back(fds[i].fd);
            }
            for (const int fd : gone) {
                std::erase(clients, fd);
                ::close(fd);
            }
            std::unique_lock lock(mutex);
            open = clients.size();
            if (motion && Clock::now() >= nextMotion) {
                move();
                nextMotion = Clock::now() + options.motionPeriod;
            }
        }
        std::unique_lock lock(mutex);
        closeClients();
        closeListener();
        applied = requested;
        changed.notify_all();
    }

    // Acts on what the other threads asked for (under the lock).
    void applyControl() {
        if (refusing && listener >= 0) closeListener();
        if (!refusing && listener < 0) {
            try {
                openListener();
            } catch (const std::runtime_error&) {
                // Port taken meanwhile: try again at the next turn.
            }
        }
        if (dropRequested) {
            closeClients();
            dropRequested = false;
        }
        applied = requested;
        changed.notify_all();
    }

    void accept() {
        const int fd = ::accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (fd < 0) return;
        std::unique_lock lock(mutex);
        clients.push_back(fd);
        open = clients.size();
        ++accepted;
    }

    // Answers one request on fd; false when the connection is to be closed.
    bool serve(int fd) {
        std::array<uint8_t, MODBUS_TCP_MAX_ADU_LENGTH> query{};
        modbus_set_socket(ctx, fd);
        const int length = modbus_receive(ctx, query.data());
        if (length < 0) return false;
        if (length < kHeader + 1) return true;

        const uint8_t function = query[kHeader];
        const uint16_t address = length >= kHeader + 3 ? be16(&query[kHeader + 1]) : 0;
        uint16_t count = length >= kHeader + 5 ? be16(&query[kHeader + 3]) : 0;
        if (function == kWriteSingleCoil || function == kWriteSingleRegister) count = 1;
        if (function == kReadExceptionStatus) count = 0;

        std::chrono::milliseconds delay{0};
        bool quiet = false;
        bool garble = false;
        {
            std::unique_lock lock(mutex);
            log.push_back({function, address, count});
            if (log.size() > kLogLimit) log.pop_front();
            quiet = silent;
            garble = garbled;
            delay = replyDelay;
        }
        if (quiet) return true;
        if (delay.count() > 0 && !waitLate(delay)) return false;
        if (garble) {
            sendGarbled(fd, query.data());
            return true;
        }
        if (function == kReadExceptionStatus) {
            sendExceptionStatus(fd, query.data());
            return true;
        }
        return reply(query.data(), length, function, address, count);
    }

    // Sleeps through a late answer; false when the simulator stops meanwhile.
    bool waitLate(std::chrono::milliseconds delay) {
        const auto until = Clock::now() + delay;
        for (;;) {
            const auto left =
                std::chrono::duration_cast<std::chrono::milliseconds>(until - Clock::now());
            if (left.count() <= 0) return true;
            pollfd p{wake, POLLIN, 0};
            ::poll(&p, 1, static_cast<int>(left.count()));
            std::unique_lock lock(mutex);
            if (stopping) return false;
        }
    }

    bool reply(const uint8_t* query, int length, uint8_t function, uint16_t address,
               uint16_t count) {
        std::unique_lock lock(mutex);
        bool valid = false;
        switch (function) {
            case kReadInputRegisters:
                valid = inside(address, count, 0, InputWords);
                if (valid) {
                    for (int i = 0; i < count; ++i)
                        mapping->tab_input_registers[address + i] =
                            static_cast<uint16_t>(inputWords[address + i]);
                }
                break;
            case kReadHoldingRegisters:
                valid = inside(address, count, kWordReadBack, OutputWords);
                if (valid) {
                    for (int i = 0; i < count; ++i)
                        mapping->tab_registers[address + i] =
                            static_cast<uint16_t>(outputWords[address + i - kWordReadBack]);
                }
                break;
            case kReadDiscreteInputs:
                valid = inside(address, count, 0, InputBits);
                if (valid) {
                    for (int i = 0; i < count; ++i)
                        mapping->tab_input_bits[address + i] = inputBits[address + i];
                }
                break;
            case kReadCoils:
                valid = count >= 1;
                for (int i = 0; valid && i < count; ++i) {
                    const int bit = outputBitReadAt(address + i);
                    valid = bit >= 0;
                    if (valid) mapping->tab_bits[address + i] = outputBits[bit];
                }
                break;
            case kWriteSingleRegister:
            case kWriteMultipleRegisters:
                valid = inside(address, count, 0, OutputWords);
                break;
            case kWriteSingleCoil:
            case kWriteMultipleCoils:
                valid = inside(address, count, 0, OutputBits);
                break;
            default:
                // A coupler serves nothing else.
                return modbus_reply_exception(ctx, query, MODBUS_EXCEPTION_ILLEGAL_FUNCTION) >= 0;
        }
        if (!valid)
            return modbus_reply_exception(ctx, query, MODBUS_EXCEPTION_ILLEGAL_DATA_ADDRESS) >= 0;
        if (modbus_reply(ctx, query, length, mapping) < 0) return false;
        if (function == kWriteSingleRegister || function == kWriteMultipleRegisters) {
            for (int i = 0; i < count; ++i)
                outputWords[address + i] =
                    static_cast<int16_t>(mapping->tab_registers[address + i]);
        } else if (function == kWriteSingleCoil || function == kWriteMultipleCoils) {
            for (int i = 0; i < count; ++i)
                outputBits[address + i] = mapping->tab_bits[address + i] != 0;
        }
        return true;
    }

    // Function 07 is not among the functions libmodbus serves: answered here.
    void sendExceptionStatus(int fd, const uint8_t* query) {
        uint8_t status;
        {
            std::unique_lock lock(mutex);
            status = exceptionStatus;
        }
        const uint8_t reply[] = {query[0], query[1], 0, 0, 0, 3, query[6], kReadExceptionStatus,
                                 status};
        sendAll(fd, reply, sizeof reply);
    }

    // The right transaction, then a byte count and data that fit no request.
    static void sendGarbled(int fd, const uint8_t* query) {
        const uint8_t reply[] = {query[0], query[1], 0,    0,    0,    6,   query[6],
                                 query[7], 4,        0xDE, 0xAD, 0xBE, 0xEF};
        sendAll(fd, reply, sizeof reply);
    }

    void move() {
        ++counter;
        inputWords[0] = static_cast<int16_t>(counter);
        // -300, -200, ..., 300, 200, ..., -200: signed values on the wire.
        const int phase = static_cast<int>(counter % 12);
        inputWords[1] = static_cast<int16_t>(100 * (phase <= 6 ? phase - 3 : 9 - phase));
        for (int b = 0; b < 16; ++b) inputBits[b] = (counter >> b) & 1u;
    }

    Options options;
    uint16_t port;
    modbus_t* ctx = nullptr;
    modbus_mapping_t* mapping = nullptr;
    int wake = -1;
    int listener = -1;         // server thread only
    std::vector<int> clients;  // changed by the server thread only, under the lock
    std::thread thread;

    mutable std::mutex mutex;
    std::condition_variable changed;
    uint64_t requested = 0;
    uint64_t applied = 0;
    bool stopping = false;
    bool refusing = false;
    bool dropRequested = false;
    bool silent = false;
    bool garbled = false;
    std::chrono::milliseconds replyDelay{0};
    bool motion = true;
    Clock::time_point nextMotion;
    uint32_t counter = 0;
    uint8_t exceptionStatus = 0;
    std::array<int16_t, InputWords> inputWords{};
    std::array<int16_t, OutputWords> outputWords{};
    std::array<uint8_t, InputBits> inputBits{};
    std::array<bool, OutputBits> outputBits{};
    std::deque<Request> log;
    size_t accepted = 0;
    size_t open = 0;
};

WagoCouplerSimulator::WagoCouplerSimulator(Options options)
    : server_(std::make_unique<Server>(options)) {
    start();
}

WagoCouplerSimulator::~WagoCouplerSimulator() {
    stop();
}

void WagoCouplerSimulator::start() {
    Server& s = *server_;
    if (s.thread.joinable()) return;
    s.refusing = false;
    s.stopping = false;
    s.openListener();  // before the thread, so a failure reaches the caller
    // The host's signals (Ctrl-C) are for its own thread: the server thread starts with every
    // signal blocked.
    sigset_t all, previous;
    sigfillset(&all);
    pthread_sigmask(SIG_BLOCK, &all, &previous);
    s.thread = std::thread([&s] { s.run(); });
    pthread_sigmask(SIG_SETMASK, &previous, nullptr);
}

void WagoCouplerSimulator::stop() {
    Server& s = *server_;
    if (!s.thread.joinable()) return;
    {
        std::unique_lock lock(s.mutex);
        s.stopping = true;
    }
    const uint64_t one = 1;
    [[maybe_unused]] const ssize_t n = ::write(s.wake, &one, sizeof one);
    s.thread.join();
}

bool WagoCouplerSimulator::running() const {
    return server_->thread.joinable();
}

template <class Change>
void WagoCouplerSimulator::control(Change&& change) {
    Server& s = *server_;
    std::unique_lock lock(s.mutex);
    change(s);
    if (!s.thread.joinable()) return;  // acted on when it starts again
    const uint64_t ticket = ++s.requested;
    const uint64_t one = 1;
    [[maybe_unused]] const ssize_t n = ::write(s.wake, &one, sizeof one);
    s.changed.wait(lock, [&] { return s.applied >= ticket || s.stopping; });
}

uint16_t WagoCouplerSimulator::port() const {
    std::unique_lock lock(server_->mutex);
    return server_->port;
}

std::string WagoCouplerSimulator::endpoint() const {
    return "127.0.0.1:" + std::to_string(port());
}

void WagoCouplerSimulator::setInputWord(int index, int16_t value) {
    checkIndex(index, InputWords);
    std::unique_lock lock(server_->mutex);
    server_->inputWords[index] = value;
}

void WagoCouplerSimulator::setInputBit(int index, bool value) {
    checkIndex(index, InputBits);
    std::unique_lock lock(server_->mutex);
    server_->inputBits[index] = value;
}

int16_t WagoCouplerSimulator::inputWord(int index) const {
    checkIndex(index, InputWords);
    std::unique_lock lock(server_->mutex);
    return server_->inputWords[index];
}

bool WagoCouplerSimulator::inputBit(int index) const {
    checkIndex(index, InputBits);
    std::unique_lock lock(server_->mutex);
    return server_->inputBits[index] != 0;
}

void WagoCouplerSimulator::setOutputWord(int index, int16_t value) {
    checkIndex(index, OutputWords);
    std::unique_lock lock(server_->mutex);
    server_->outputWords[index] = value;
}

void WagoCouplerSimulator::setOutputBit(int index, bool value) {
    checkIndex(index, OutputBits);
    std::unique_lock lock(server_->mutex);
    server_->outputBits[index] = value;
}

int16_t WagoCouplerSimulator::outputWord(int index) const {
    checkIndex(index, OutputWords);
    std::unique_lock lock(server_->mutex);
    return server_->outputWords[index];
}

bool WagoCouplerSimulator::outputBit(int index) const {
    checkIndex(index, OutputBits);
    std::unique_lock lock(server_->mutex);
    return server_->outputBits[index];
}

void WagoCouplerSimulator::setExceptionStatus(uint8_t status) {
    std::unique_lock lock(server_->mutex);
    server_->exceptionStatus = status;
}

void WagoCouplerSimulator::setMotion(bool on) {
    control([on](Server& s) {
        if (on && !s.motion) s.nextMotion = Clock::now() + s.options.motionPeriod;
        s.motion = on;
    });
}

void WagoCouplerSimulator::setSilent(bool on) {
    std::unique_lock lock(server_->mutex);
    server_->silent = on;
}

void WagoCouplerSimulator::setReplyDelay(std::chrono::milliseconds delay) {
    std::unique_lock lock(server_->mutex);
    server_->replyDelay = delay;
}

void WagoCouplerSimulator::setGarbled(bool on) {
    std::unique_lock lock(server_->mutex);
    server_->garbled = on;
}

void WagoCouplerSimulator::setRefusing(bool on) {
    control([on](Server& s) { s.refusing = on; });
}

void WagoCouplerSimulator::dropConnections() {
    control([](Server& s) { s.dropRequested = true; });
}

std::vector<WagoCouplerSimulator::Request> WagoCouplerSimulator::requests() const {
    std::unique_lock lock(server_->mutex);
    return {server_->log.begin(), server_->log.end()};
}

void WagoCouplerSimulator::clearRequests() {
    std::unique_lock lock(server_->mutex);
    server_->log.clear();
}

size_t WagoCouplerSimulator::connectionsAccepted() const {
    std::unique_lock lock(server_->mutex);
    return server_->accepted;
}

size_t WagoCouplerSimulator::openConnections() const {
    std::unique_lock lock(server_->mutex);
    return server_->open;
}

}  // namespace maroset::sim

namespace maroset::sim {

namespace {

std::vector<std::string> words(std::string_view line) {
    std::vector<std::string> out;
    size_t i = 0;
    while (i < line.size()) {
        while (i < line.size() && (line[i] == ' ' || line[i] == '\t')) ++i;
        const size_t start = i;
        while (i < line.size() && line[i] != ' ' && line[i] != '\t') ++i;
        if (i > start) out.emplace_back(line.substr(start, i - start));
    }
    return out;
}

// A whole number in [low, high], or nothing.
std::optional<long> number(const std::string& text, long low, long high) {
    if (text.empty()) return std::nullopt;
    char* end = nullptr;
    errno = 0;
    const long v = std::strtol(text.c_str(), &end, 10);
    if (errno != 0 || *end != '\0' || v < low || v > high) return std::nullopt;
    return v;
}

std::optional<bool> onOff(const std::string& text) {
    if (text == "on" || text == "1") return true;
    if (text == "off" || text == "0") return false;
    return std::nullopt;
}

}  // namespace

std::string WagoCouplerSimulator::help() const {
    return "iw N VALUE     set input word N (0-255) to VALUE (-32768 to 65535)\n"
           "id N 0|1       set input bit N (0-511)\n"
           "ow N           show output word N (0-255), as the host wrote it\n"
           "od N           show output bit N (0-4607)\n"
           "status VALUE   the exception status byte function 07 answers (0-255)\n"
           "motion on|off  inputs move once a second, or stay as set\n"
           "silent on|off  take requests and never answer them\n"
           "delay MS       answer every request MS ms late (0: at once)\n"
           "garble on|off  answer with replies that fit no request\n"
           "refuse on|off  stop listening: connects are refused\n"
           "drop           close every open connection now\n"
           "show           connections, requests served, faults in force\n"
           "help           this list";
}

std::string WagoCouplerSimulator::command(std::string_view line) {
    const std::vector<std::string> w = words(line);
    if (w.empty()) return "error: empty command (type help)";
    const std::string& verb = w[0];
    const auto arg = [&](size_t i) { return i < w.size() ? w[i] : std::string(); };
    const auto usage = [&](const char* form) { return std::string("error: usage: ") + form; };
    if (w.size() > 3) return "error: too many words (type help)";

    if (verb == "help") return help();
    if (verb == "iw") {
        const auto n = number(arg(1), 0, InputWords - 1);
        const auto v = number(arg(2), -32768, 65535);
        if (!n || !v || w.size() != 3) return usage("iw N VALUE");
        setInputWord(static_cast<int>(*n), static_cast<int16_t>(static_cast<uint16_t>(*v)));
        return "input word " + std::to_string(*n) + " = " + std::to_string(inputWord(*n));
    }
    if (verb == "id") {
        const auto n = number(arg(1), 0, InputBits - 1);
        const auto v = onOff(arg(2));
        if (!n || !v || w.size() != 3) return usage("id N 0|1");
        setInputBit(static_cast<int>(*n), *v);
        return "input bit " + std::to_string(*n) + " = " + (*v ? "1" : "0");
    }
    if (verb == "ow") {
        const auto n = number(arg(1), 0, OutputWords - 1);
        if (!n || w.size() != 2) return usage("ow N");
        return "output word " + std::to_string(*n) + " = " + std::to_string(outputWord(*n));
    }
    if (verb == "od") {
        const auto n = number(arg(1), 0, OutputBits - 1);
        if (!n || w.size() != 2) return usage("od N");
        return "output bit " + std::to_string(*n) + " = " + (outputBit(*n) ? "1" : "0");
    }
    if (verb == "status") {
        const auto v = number(arg(1), 0, 255);
        if (!v || w.size() != 2) return usage("status VALUE");
        setExceptionStatus(static_cast<uint8_t>(*v));
        return "exception status = " + std::to_string(*v);
    }
    if (verb == "delay") {
        const auto v = number(arg(1), 0, 60000);
        if (!v || w.size() != 2) return usage("delay MS");
        setReplyDelay(std::chrono::milliseconds(*v));
        return *v ? "answering " + std::to_string(*v) + " ms late" : "answering at once";
    }
    if (verb == "drop") {
        if (w.size() != 1) return usage("drop");
        dropConnections();
        return "connections closed";
    }
    if (verb == "show") {
        if (w.size() != 1) return usage("show");
        const Server& s = *server_;
        std::unique_lock lock(s.mutex);
        std::string out = "port " + std::to_string(s.port) + ", " + std::to_string(s.open) +
                          " connection(s) open, " + std::to_string(s.accepted) + " accepted, " +
                          std::to_string(s.log.size()) + " request(s) logged";
        if (s.silent) out += ", silent";
        if (s.garbled) out += ", garbling";
        if (s.refusing) out += ", refusing";
        if (s.replyDelay.count() > 0)
            out += ", " + std::to_string(s.replyDelay.count()) + " ms late";
        out += s.motion ? ", inputs moving" : ", inputs still";
        return out;
    }
    using Setter = void (WagoCouplerSimulator::*)(bool);
    const struct {
        const char* verb;
        Setter set;
        const char* on;
        const char* off;
    } switches[] = {
        {"motion", &WagoCouplerSimulator::setMotion, "inputs moving", "inputs still"},
        {"silent", &WagoCouplerSimulator::setSilent, "silent: requests go unanswered",
         "answering again"},
        {"garble", &WagoCouplerSimulator::setGarbled, "garbling replies", "replies in order"},
        {"refuse", &WagoCouplerSimulator::setRefusing, "refusing connections",
         "accepting connections"},
    };
    for (const auto& sw : switches) {
        if (verb != sw.verb) continue;
        const auto v = onOff(arg(1));
        if (!v || w.size() != 2) return usage((verb + " on|off").c_str());
        (this->*sw.set)(*v);
        return *v ? sw.on : sw.off;
    }
    return "error: unknown command '" + verb + "' (type help)";
}

}  // namespace maroset::sim
