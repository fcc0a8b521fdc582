// What a soft-PLC server (or anything answering on its port) sends reaches the client's
// arrival handler in chunks of any size. The input is a list of records, each either raw
// bytes or a frame with a correct CRC around fuzzed data (so the payload paths are reached),
// all cut into chunks at fuzzed points and delivered through the in-memory transport to a
// subscribed driver. Nothing may escape into the loop, and every value report must hold
// arrays as long as its count.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "drivers/softplc/MessageFrame.h"

#include "FuzzInput.h"
#include "SoftPlcFuzzLine.h"

using namespace maroset;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    // The runtime and the host are built once per process; each input has a node of its own.
    static fuzz::SoftPlcFuzzLine line;
    static ClsNodeDBInterface host;
    static const auto values =
        host.ValueChange.subscribe([](VbArray<int32_t>& ids, int16_t count, VbArray<Variant>& v) {
            if (ids.size() != count || v.size() != count || ids.LBound() != 1) std::abort();
        });
    platform::VirtualEventLoop& loop = *line.loop;
    std::shared_ptr<platform::MemoryTcpLink>& link = line.link;
    link.reset();
    auto plc = std::make_shared<node>();
    plc->Name = "PLC1";
    plc->DriverName = Variant("NUVTCPIP");
    plc->ScanRate = Variant(int32_t{1000});
    plc->IPAddress = Variant("plc");
    plc->Port = Variant(int32_t{5000});
    plc->Init();
    plc->AddTag(41, "Level");
    plc->IsActive(true);
    if (!link) std::abort();

    fuzz::FuzzInput in{data, size};
    std::string stream;
    int32_t number = 0;
    while (in.more()) {
        const uint8_t op = in.byte();
        std::string body = in.bytes(in.byte());
        if (op & 1) {
            static const char* const kTypes[] = {"NTV", "ACK", "NAK", "SSD", "ERR", "MSG"};
            body = MessageFrame::Build(kTypes[(op >> 1) % 6], number++ % 1000, body);
        }
        stream += body;
    }
    // Cut the stream at points the input's last bytes choose; each piece is one arrival.
    size_t at = 0, cut = size > 0 ? data[size - 1] : 1;
    while (at < stream.size()) {
        const size_t n = std::max<size_t>(1, cut % 97);
        link->serverEnd()->write(stream.substr(at, n));
        at += n;
        cut = cut * 31 + 7;
        loop.advance(std::chrono::milliseconds(cut % 700));
    }
    loop.advance(std::chrono::milliseconds(10000));  // every resend runs out
    plc->IsActive(false);
    plc.reset();
    loop.advance(std::chrono::milliseconds(100));
    return 0;
}
