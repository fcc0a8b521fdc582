#pragma once

#include <filesystem>
#include <memory>

#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"
#include "platform/tcp/MemoryTcpLink.h"

#include "FuzzRuntime.h"

namespace maroset::fuzz {

// A runtime on a virtual loop whose only soft-PLC server is an in-memory one at "plc":5000
// that swallows what the client sends; `link` is the latest connection a client made. Built
// once per fuzzing process: each input brings its own driver and leaves it shut down.
struct SoftPlcFuzzLine {
    SoftPlcFuzzLine() : scope(VirtualRuntime(loop)) {
        scope->tcp().setRealSockets(false);
        scope->tcp().plug("plc", 5000, [this](const std::shared_ptr<platform::MemoryTcpLink>& l) {
            link = l;
            l->serverEnd()->listen({{}, {}, [](std::string_view) {}, {}, {}});
        });
    }

    platform::VirtualEventLoop* loop = nullptr;
    ScopedRuntime scope;
    std::shared_ptr<platform::MemoryTcpLink> link;

};

}  // namespace maroset::fuzz
