#pragma once

#include "core/ScopedRuntime.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

#include "FuzzRuntime.h"

namespace maroset::fuzz {

// A runtime on a virtual loop with an in-memory cable on serial port 1 (/dev/ttyS0). Built once
// per fuzzing process; each input takes what its driver sent and received out of the cable
// before it returns, so the next one starts as on a fresh line.
struct SerialFuzzLine {
    SerialFuzzLine() : scope(VirtualRuntime(loop)), cable(*loop) {
        scope->serialDevices().plug("/dev/ttyS0", cable.hostEnd());
    }

    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope;
    platform::MemorySerialCable cable;
};

}  // namespace maroset::fuzz
