// A scan pass of the coupler driver over N tags against the coupler simulator on loopback, per
// tag, beside a raw libmodbus loop that makes the same reads on one connection. Both wait for
// the same round trips; what remains is the driver's own work per tag (the yield to pending
// events, the MBT layer, the change check). per_tag is the wall time of one tag.
#include <benchmark/benchmark.h>
#include <modbus.h>
#include <stdlib.h>

#include <array>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "drivers/wago/ClsDriverWagoIO.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "sim/wago/WagoCouplerSimulator.h"

namespace {

using namespace maroset;
namespace fs = std::filesystem;

// Tag i: the four kinds in turn, each at address i.
std::string tagAddress(int i) {
    static const char* const kinds[] = {"IW", "OW", "ID", "OD"};
    return kinds[i % 4] + std::to_string(i);
}

class CouplerSetup {
  public:
    CouplerSetup() {
        std::string pattern = (fs::temp_directory_path() / "maroset-wago-XXXXXX").string();
        root_ = ::mkdtemp(pattern.data());
        scope_ = std::make_unique<ScopedRuntime>(
            std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                      std::make_unique<platform::SystemClock>(), root_));
        (*scope_)->setModbusPort(coupler.port());
        for (int i = 0; i < 256; ++i) coupler.setInputWord(i, static_cast<int16_t>(i * 3));
    }
    ~CouplerSetup() {
        scope_.reset();
        std::error_code ec;
        fs::remove_all(root_, ec);
    }

    sim::WagoCouplerSimulator coupler{{.port = 0, .motion = false}};

  private:
    fs::path root_;
    std::unique_ptr<ScopedRuntime> scope_;
};

void perTag(benchmark::State& state, int tags) {
    state.SetItemsProcessed(state.iterations() * tags);
    state.counters["per_tag"] =
        benchmark::Counter(static_cast<double>(state.iterations()) * tags,
                           benchmark::Counter::kIsRate | benchmark::Counter::kInvert);
}

// The driver as a node sets it up; each iteration is one pass (one PollTime tick).
void DriverScan(benchmark::State& state) {
    const int tags = static_cast<int>(state.range(0));
    CouplerSetup setup;
    ClsDriverWagoIO driver;
    driver.ScanRate(Variant(int32_t{1000}));
    driver.IPAddress(Variant("127.0.0.1"));
    driver.startup("WagoIO", "Coupler");
    driver.NodeName("Coupler");
    for (int i = 0; i < tags; ++i) driver.AddItem(tagAddress(i), static_cast<int16_t>(i + 1));
    if (!driver.Connected()) state.SkipWithError("the driver did not connect");
    FrmWagoTCP* owner = driver.ScanOwner();
    owner->PollTime.raise();  // the first pass reports every tag; the rest report nothing
    for (auto _ : state) owner->PollTime.raise();
    perTag(state, tags);
}
BENCHMARK(DriverScan)->Arg(8)->Arg(64)->UseRealTime()->Unit(benchmark::kMicrosecond);

// The same reads straight through libmodbus, values swapped as the driver does.
void RawLibmodbusScan(benchmark::State& state) {
    const int tags = static_cast<int>(state.range(0));
    CouplerSetup setup;
    modbus_t* ctx = modbus_new_tcp("127.0.0.1", setup.coupler.port());
    modbus_set_response_timeout(ctx, 0, 100000);
    if (modbus_connect(ctx) != 0) state.SkipWithError("no connection");
    uint16_t word = 0;
    uint8_t bit = 0;
    int64_t sum = 0;
    for (auto _ : state) {
        for (int i = 0; i < tags; ++i) {
            int rc = 0;
            switch (i % 4) {
                case 0:
                    rc = modbus_read_input_registers(ctx, i, 1, &word);
                    break;
                case 1:
                    rc = modbus_read_registers(ctx, i + 512, 1, &word);
                    break;
                case 2:
                    rc = modbus_read_input_bits(ctx, i, 1, &bit);
                    break;
                default:
                    rc = modbus_read_bits(ctx, i < 4095 ? i + 512 : i + 4096, 1, &bit);
                    break;
            }
            if (rc != 1) state.SkipWithError("a read failed");
            sum += static_cast<int16_t>(word) + bit;
        }
    }
    benchmark::DoNotOptimize(sum);
    modbus_close(ctx);
    modbus_free(ctx);
    perTag(state, tags);
}
BENCHMARK(RawLibmodbusScan)->Arg(8)->Arg(64)->UseRealTime()->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
