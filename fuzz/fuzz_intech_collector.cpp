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

#include "SerialFuzzLine.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;


}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    // Built once per process, with its own clock: the system clock would cost a call into
    // the kernel at every reading.
    static fuzz::SerialFuzzLine line;
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
