// Whatever arrives on an Intech line goes through the collector and the frame check; frames
// that pass are decoded and matched against the driver's tags. Garbage may cost replies, but
// never crashes, leaks or stalls polling beyond the next tick.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "core/ClsNodeDBInterface.h"
#include "core/ScopedRuntime.h"
#include "core/nodeDB.h"
#include "drivers/intech/ClsDriverIntech.h"
#include "drivers/intech/FrmNUVIntech.h"
#include "lang/VbError.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;

// Built once per fuzzing process: the runtime on the virtual loop and its own clock (the
// system clock would cost a call into the kernel at every reading), and the cable on port 1.
struct Line {
    Line() : scope(MakeRuntime(loop)), cable(*loop) {
        scope->serialDevices().plug("/dev/ttyS0", cable.hostEnd());
    }
    static std::unique_ptr<Runtime> MakeRuntime(platform::VirtualEventLoop*& loopOut) {
        auto owner = std::make_unique<platform::VirtualEventLoop>();
        loopOut = owner.get();
        auto clock = std::make_unique<platform::VirtualClock>(*owner, platform::ZeroDate);
        return std::make_unique<Runtime>(std::move(owner), std::move(clock),
                                         std::filesystem::temp_directory_path());
    }

    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope;
    platform::MemorySerialCable cable;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static Line line;
    const std::string_view input(reinterpret_cast<const char*>(data), size);

    platform::MemorySerialCable& cable = line.cable;
    auto driver = std::make_shared<ClsDriverIntech>();
    driver->ScanRate(Variant(int32_t{100}));
    driver->startup(" ", "Meter");
    for (const char* tag : {"01LAI1", "01LAI16", "01EAI17", "01EAI64", "01LDI4", "01LDO1"})
        driver->AddItem(tag, 1);
    driver->IsActive(true);
    FrmNUVIntech& owner = *driver->NUVIntech();

    // The bytes as the line delivers them, one receive event per character.
    line.loop->advance(100ms);
    cable.deviceEnd()->write(input);
    line.loop->advance(0ms);
    cable.takeHostSent();
    line.loop->advance(100ms);
    const std::string sent = cable.takeHostSent();
    if (sent.empty() || sent.back() != '\r') std::abort();  // polling stalled

    // The same bytes as one frame with a check that matches, to reach every decoder.
    std::string frame(input);
    frame += ':';
    frame += FrmNUVIntech::CalcBCC(frame);
    if (!frame.empty()) frame[0] = '@';
    try {
        owner.RXData(frame);
    } catch (const VbError&) {
        // A field that is not a number is a run-time error, as on the line.
    }
    line.loop->advance(0ms);
    driver->shutdown();
    cable.takeHostSent();
    cable.takeDeviceSent();
    return 0;
}
