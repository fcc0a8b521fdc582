// Data-table addresses come from hosts and project files. Checking one, and building a
// request from what it left, gives an answer or a clear run-time error, never a crash.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>

#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "lang/VbError.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/SerialDevice.h"

namespace {

using namespace maroset;

class NullDevice final : public platform::SerialDevice {
  public:
    void listen(Handlers) override {}
    void stopListening() override {}
    bool write(std::string_view) override { return true; }
    std::string name() const override { return "null"; }
};

bool expected(const VbError& e) {
    // Invalid procedure call (a negative length), Overflow, Type mismatch.
    return e.number() == 5 || e.number() == 6 || e.number() == 13;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static ScopedRuntime* runtime = [] {
        auto loop = std::make_unique<platform::VirtualEventLoop>();
        auto clock = std::make_unique<platform::VirtualClock>(*loop, platform::ZeroDate);
        auto* scope = new ScopedRuntime(std::make_unique<Runtime>(
            std::move(loop), std::move(clock), std::filesystem::temp_directory_path()));
        (*scope)->serialDevices().plug("/dev/ttyS0", std::make_shared<NullDevice>());
        return scope;
    }();
    (void)runtime;

    FrmNUVProSerial owner("PLC");
    owner.PLCWordCount(2);
    owner.PLCFunction(Variant(int16_t{1}));
    try {
        owner.PLCAddress(Variant(std::string(reinterpret_cast<const char*>(data), size)));
        const Variant answer = owner.CheckAddress();
        if (!answer.isEmpty() && !(answer == Variant("Invalid PLC Address"))) abort();
    } catch (const VbError& e) {
        if (!expected(e)) abort();
    }
    try {
        owner.RefreshData();
    } catch (const VbError& e) {
        if (!expected(e)) abort();
    }
    return 0;
}
