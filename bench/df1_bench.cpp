// The DF1 link's cost per byte: read replies fed byte by byte through the port's receive event
// into the driver's change reports, the receiver's steps alone, and a request built and framed.
// At 19200 baud a line carries at most 1,920 bytes a second: the share of one core the link
// takes at line rate is (CPU time per byte) x 1,920 / 1 s.
#include <benchmark/benchmark.h>

#include <filesystem>
#include <memory>
#include <string>

#include "BenchRuntime.h"
#include "core/ClsNodeDBInterface.h"
#include "core/Crc16Arc.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"
#include "drivers/df1/Df1Receiver.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"
#include "platform/serial/SerialDevice.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;

// A read reply as the PLC sends it: words base, base+1, ... (some bytes are DLEs, doubled).
std::string ReplyFrame(int words, int base) {
    std::string body{0, 1, 0x4F, 0, 1, 0};
    for (int i = 0; i < words; ++i) {
        const int w = base + i * 0x0101;
        body += static_cast<char>(w & 0xFF);
        body += static_cast<char>((w >> 8) & 0xFF);
    }
    std::string frame{0x10, 0x02};
    for (const char c : body) {
        frame += c;
        if (c == 0x10) frame += c;
    }
    const uint16_t crc = crc16arc::Fold(3, crc16arc::Fold(body));
    frame += {0x10, 0x03, static_cast<char>(crc & 0xFF), static_cast<char>(crc >> 8)};
    return frame;
}

void PerByte(benchmark::State& state, size_t bytesPerIteration) {
    state.SetBytesProcessed(static_cast<int64_t>(state.iterations() * bytesPerIteration));
    state.counters["cpu_per_byte"] = benchmark::Counter(
        double(bytesPerIteration),
        benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// A NUVABDF1 node with `words` tags N7:0.. whose values change with every reply: each
// iteration delivers one whole reply frame to the port, which raises one receive event per
// byte; the driver ACKs it, decodes the words and reports every tag to a host.
void ReplyToValueReports(benchmark::State& state) {
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope(bench::VirtualRuntime(&loop));
    platform::MemorySerialCable cable(*loop);
    scope->serialDevices().plug("/dev/ttyS0", cable.hostEnd());
    ClsNodeDBInterface host;
    int64_t reported = 0;
    auto sub = host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t n, VbArray<Variant>&) { reported += n; });
    auto db = host.nodeDB();
    db->AddNode("PLC", "NUVABDF1", "", 500);
    const int words = static_cast<int>(state.range(0));
    for (int i = 0; i < words; ++i) db->getNode("PLC")->AddTag(i + 1, "N7:" + std::to_string(i));
    db->StartScanning();
    loop->advance(500ms);  // one poll: the port is open and a read is the last request
    db->StopScanning();
    const std::string frames[2] = {ReplyFrame(words, 0x0F01), ReplyFrame(words, 0x1003)};
    int turn = 0;
    for (auto _ : state) {
        cable.deviceEnd()->write(frames[turn ^= 1]);
        loop->advance(0ms);
        cable.takeHostSent();
        cable.takeDeviceSent();
    }
    if (reported != int64_t(state.iterations()) * words) state.SkipWithError("values lost");
    PerByte(state, frames[0].size());
    state.counters["frame_bytes"] = double(frames[0].size());
}
BENCHMARK(ReplyToValueReports)->Arg(1)->Arg(10)->Arg(100);

// The receiver's steps alone, with a link that does nothing: the floor under the above.
void ReceiverSteps(benchmark::State& state) {
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope(bench::VirtualRuntime(&loop));
    struct NullLink final : Df1Receiver::Link {
        void restartEndOfMessage() override {}
        void stopEndOfMessage() override {}
        bool frameReceived() override { return true; }
        bool controlReceived(uint8_t) override { return true; }
    } link;
    Df1Receiver rx(2 * 100 + 15);
    const std::string frame = ReplyFrame(static_cast<int>(state.range(0)), 0x1003);
    for (auto _ : state) {
        Procedure proc("FrmNUVProSerial", "MSComm1_OnComm");
        for (const char c : frame) rx.feed(static_cast<uint8_t>(c), link, proc);
        benchmark::DoNotOptimize(rx.RxCount);
    }
    PerByte(state, frame.size());
}
BENCHMARK(ReceiverSteps)->Arg(10)->Arg(100);

// A device that takes every byte and keeps none.
class NullDevice final : public platform::SerialDevice {
  public:
    void listen(Handlers) override {}
    void stopListening() override {}
    bool write(std::string_view bytes) override {
        benchmark::DoNotOptimize(bytes.data());
        return true;
    }
    std::string name() const override { return "null"; }
};

// One read request of N7:0 built, framed and written, and its DLE ACK taken.
void RequestBuiltAndFramed(benchmark::State& state) {
    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope(bench::VirtualRuntime(&loop));
    scope->serialDevices().plug("/dev/ttyS0", std::make_shared<NullDevice>());
    FrmNUVProSerial owner("PLC");
    owner.PLCNode(1);
    owner.PLCWordCount(static_cast<uint8_t>(state.range(0)));
    owner.PLCAddress(Variant("N7:0"));
    owner.PLCFunction(Variant(int16_t{1}));
    for (auto _ : state) {
        owner.RefreshData();
        owner.feed(0x10);
        owner.feed(0x06);
    }
    if (owner.AwaitingReply()) state.SkipWithError("request not acknowledged");
}
BENCHMARK(RequestBuiltAndFramed)->Arg(10);

}  // namespace

BENCHMARK_MAIN();
