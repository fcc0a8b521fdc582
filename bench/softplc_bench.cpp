// The soft-PLC path end to end over loopback TCP: NTV frames in, an ACK out for each, the
// values delivered to the host as ValueChange events. The server side is either a raw pusher
// on a thread of its own (pre-built frames written as fast as the socket takes them, so the
// host's one thread is what is measured) or the simulator on the host's own loop. Next to it,
// the same bytes through a bare socket that only finds the frames and answers each with a
// fixed ACK: what the system adds beyond reading and writing the socket. And the frame check
// alone, per byte.
#include <benchmark/benchmark.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cstring>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "drivers/softplc/MessageFrame.h"
#include "drivers/softplc/ModTCPIP.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "sim/softplc/ServerFrames.h"
#include "sim/softplc/SoftPlcSimulator.h"

namespace {

using namespace maroset;

// The data of one NTV frame with `values` tags, handles from 41.
std::string ntvData(int values, int round) {
    std::string data = std::to_string(values);
    for (int i = 0; i < values; ++i)
        data += ";~" + std::to_string(41 + i) + ";~" + std::to_string((round * 7 + i) % 1000);
    return data;
}

// A server on a thread of its own: accepts one client, then writes NTV frames (numbers 000
// to 999 over and over) as fast as the client reads them, and reads and drops whatever the
// client sends (its ACKs and subscription).
class RawPusher {
  public:
    explicit RawPusher(int valuesPerFrame) {
        for (int n = 0; n < 1000; ++n)
            stream_ += sim::ServerFrame::Write("NTV", n, ntvData(valuesPerFrame, n));
        listener_ = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
        sockaddr_in addr{};
        addr.sin_family = AF_INET;
        addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        ::bind(listener_, reinterpret_cast<sockaddr*>(&addr), sizeof addr);
        ::listen(listener_, 1);
        socklen_t len = sizeof addr;
        ::getsockname(listener_, reinterpret_cast<sockaddr*>(&addr), &len);
        port_ = ntohs(addr.sin_port);
        thread_ = std::thread([this] { serve(); });
    }
    ~RawPusher() {
        stop_ = true;
        ::shutdown(listener_, SHUT_RDWR);
        thread_.join();
        ::close(listener_);
    }
    int port() const { return port_; }

  private:
    void serve() {
        const int fd = ::accept(listener_, nullptr, nullptr);
        if (fd < 0) return;
        size_t at = 0;
        char sink[65536];
        while (!stop_) {
            pollfd p{fd, POLLIN | POLLOUT, 0};
            if (::poll(&p, 1, 50) <= 0) continue;
            if (p.revents & POLLIN) {
                if (::recv(fd, sink, sizeof sink, MSG_DONTWAIT) == 0) break;
            }
            if (p.revents & POLLOUT) {
                const ssize_t n = ::send(fd, stream_.data() + at, stream_.size() - at,
                                         MSG_DONTWAIT | MSG_NOSIGNAL);
                if (n > 0) at = (at + static_cast<size_t>(n)) % stream_.size();
            }
            if (p.revents & (POLLERR | POLLHUP)) break;
        }
        ::close(fd);
    }

    std::string stream_;
    int listener_ = -1;
    int port_ = 0;
    std::atomic<bool> stop_{false};
    std::thread thread_;
};

// A host on the real loop with one NUVTCPIP node at 127.0.0.1:port, subscribed, counting the
// values it receives.
class Host {
  public:
    Host(int port, int tags)
        : scope_(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                           std::make_unique<platform::SystemClock>(),
                                           std::filesystem::temp_directory_path())) {
        values_ =
            host_.ValueChange.subscribe([this](VbArray<int32_t>&, int16_t n, VbArray<Variant>&) {
                received += n;
                if (received >= target) scope_->loop().stop();
            });
        node_ = std::make_shared<node>();
        node_->Name = "PLC1";
        node_->DriverName = Variant("NUVTCPIP");
        node_->ScanRate = Variant(int32_t{1000});
        node_->IPAddress = Variant("127.0.0.1");
        node_->Port = Variant(int32_t{port});
        node_->Init();
        for (int i = 0; i < tags; ++i) node_->AddTag(41 + i, "Tag" + std::to_string(i));
        node_->IsActive(true);
    }
    ~Host() {
        node_->IsActive(false);
        node_.reset();
    }
    // Runs the loop until `values` more values have arrived.
    void receive(int64_t values) {
        target = received + values;
        while (received < target) scope_->loop().run();
    }
    platform::EventLoop& loop() { return scope_->loop(); }

    int64_t received = 0;
    int64_t target = 0;

  private:
    ScopedRuntime scope_;
    ClsNodeDBInterface host_;
    Subscription values_;
    std::shared_ptr<node> node_;
};

constexpr int64_t kBatch = 20000;

void SoftPlcEndToEndFromRawPusher(benchmark::State& state) {
    const int perFrame = static_cast<int>(state.range(0));
    RawPusher pusher(perFrame);
    Host host(pusher.port(), perFrame);
    host.receive(kBatch);  // warm up: connected, buffers full
    for (auto _ : state) host.receive(kBatch);
    state.SetItemsProcessed(state.iterations() * kBatch);
    state.counters["values/s"] = benchmark::Counter(
        static_cast<double>(state.iterations() * kBatch), benchmark::Counter::kIsRate);
}
BENCHMARK(SoftPlcEndToEndFromRawPusher)
    ->Arg(1)
    ->Arg(10)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

// The simulator on the host's own loop: both ends of the link on one core.
void SoftPlcEndToEndOneLoop(benchmark::State& state) {
    const int perFrame = static_cast<int>(state.range(0));
    ScopedRuntime scope(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                                  std::make_unique<platform::SystemClock>(),
                                                  std::filesystem::temp_directory_path()));
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {0, 0});
    ClsNodeDBInterface host;
    int64_t received = 0, target = 0;
    auto values = host.ValueChange.subscribe([&](VbArray<int32_t>&, int16_t n, VbArray<Variant>&) {
        received += n;
        if (received >= target) scope->loop().stop();
    });
    auto plc = std::make_shared<node>();
    plc->Name = "PLC1";
    plc->DriverName = Variant("NUVTCPIP");
    plc->ScanRate = Variant(int32_t{1000});
    plc->IPAddress = Variant("127.0.0.1");
    plc->Port = Variant(sim->port());
    plc->Init();
    for (int i = 0; i < perFrame; ++i) plc->AddTag(41 + i, "Tag" + std::to_string(i));
    target = perFrame;
    plc->IsActive(true);
    while (received < target) scope->loop().run();  // the first values: subscribed
    // Bursts of frames while fewer than kInFlight values are on their way: far fewer than
    // the thousand message numbers, so none is reused while it waits for its ACK. A frame
    // the transport cuts is NAKed and resent, as on any link.
    constexpr int64_t kInFlight = 2000;
    const int burst = std::max(1, 100 / perFrame);
    int64_t pushed = received;
    for (auto _ : state) {
        target = received + kBatch;
        while (received < target) {
            if (pushed - received < kInFlight) {
                sim->flood(burst);
                pushed += static_cast<int64_t>(burst) * perFrame;
            }
            scope->loop().pump();
        }
    }
    state.SetItemsProcessed(state.iterations() * kBatch);
    plc->IsActive(false);
    plc.reset();
}
BENCHMARK(SoftPlcEndToEndOneLoop)->Arg(1)->Arg(10)->Unit(benchmark::kMillisecond)->UseRealTime();

// The baseline: the same stream read from a bare socket that finds each frame's end and
// writes one fixed ACK per frame, nothing else.
void RawSocketBaseline(benchmark::State& state) {
    const int perFrame = static_cast<int>(state.range(0));
    RawPusher pusher(perFrame);
    const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const int on = 1;
    ::setsockopt(fd, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
    sockaddr_in addr{};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    addr.sin_port = htons(static_cast<uint16_t>(pusher.port()));
    ::connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof addr);
    const std::string ack = sim::ServerFrame::Write("ACK", 1, "001");
    char buffer[65536];
    bool percent = false;
    auto receive = [&](int64_t values) {
        int64_t got = 0;
        while (got < values) {
            const ssize_t n = ::recv(fd, buffer, sizeof buffer, 0);
            if (n <= 0) return;
            for (ssize_t i = 0; i < n; ++i) {
                if (percent && buffer[i] == '>') {
                    got += perFrame;
                    ::send(fd, ack.data(), ack.size(), MSG_NOSIGNAL);
                }
                percent = buffer[i] == '%';
            }
        }
    };
    receive(kBatch);
    for (auto _ : state) receive(kBatch);
    state.SetItemsProcessed(state.iterations() * kBatch);
    ::close(fd);
}
BENCHMARK(RawSocketBaseline)->Arg(1)->Arg(10)->Unit(benchmark::kMillisecond)->UseRealTime();

// The frame check of one received piece, per byte: length, CRC over the body, the fields.
void SoftPlcJudgePiece(benchmark::State& state) {
    const std::string frame =
        MessageFrame::Build("NTV", 123, ntvData(static_cast<int>(state.range(0)), 1));
    const std::string piece = frame.substr(0, frame.size() - 2);
    for (auto _ : state) benchmark::DoNotOptimize(MessageFrame::Judge(piece));
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(piece.size()));
}
BENCHMARK(SoftPlcJudgePiece)->Arg(1)->Arg(10)->Arg(100);

void SoftPlcMessageCrc(benchmark::State& state) {
    const std::string body(static_cast<size_t>(state.range(0)), 'x');
    for (auto _ : state) benchmark::DoNotOptimize(ModTCPIP::MessageCRC(body));
    state.SetBytesProcessed(state.iterations() * state.range(0));
}
BENCHMARK(SoftPlcMessageCrc)->Arg(64)->Arg(1024);

}  // namespace

BENCHMARK_MAIN();
