// The driver's side of the soft-PLC payloads: pushed NTV payloads split at ";~" into counts,
// handles and values (counts far beyond the fields, handles that are not numbers), and the
// NTV and ATV texts it builds from a host's values. A bad payload is a run-time error and
// delivers nothing; a good one delivers arrays as long as their count; a written value that
// holds no "%>" comes back out of its frame unchanged.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"
#include "drivers/softplc/MessageFrame.h"

#include "SoftPlcFuzzLine.h"

using namespace maroset;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    // The runtime and the host are built once per process; each input has a driver of its own.
    static fuzz::SoftPlcFuzzLine line;
    static int64_t reported;
    static ClsNodeDBInterface host;
    static const auto values =
        host.ValueChange.subscribe([](VbArray<int32_t>& ids, int16_t count, VbArray<Variant>& v) {
            if (ids.size() != count || v.size() != count || v.LBound() != 1) std::abort();
            reported += count;
        });
    platform::VirtualEventLoop& loop = *line.loop;
    std::shared_ptr<platform::MemoryTcpLink>& link = line.link;
    reported = 0;
    link.reset();

    const std::string input(reinterpret_cast<const char*>(data), size);
    auto driver = std::make_shared<ClsDriverNUVSoftPLC>();
    driver->NodeName("PLC1");
    driver->IPAddress(Variant("plc"));
    driver->Port(Variant(int32_t{5000}));
    driver->startup("NUVTCPIP", "PLC1");
    if (!link) std::abort();  // connected within startup, in memory

    // Pushed payloads, as the client hands them over: ";~" + data + ";~".
    try {
        driver->Client_DataArrival("NTV", ";~" + input + ";~", "127.0.0.1", "plc");
    } catch (const VbError&) {
        if (reported != 0) std::abort();  // a bad payload delivers nothing
    }

    // A written value travels in an NTV frame; an array in an ATV frame.
    const std::string value = input.substr(0, input.find('\0'));
    link->takeClientSent();
    driver->WriteItem(7, Variant(value));
    const std::string frame = link->takeClientSent();
    if (frame.size() < 2 || frame.compare(frame.size() - 2, 2, "%>") != 0) std::abort();
    if (value.find("%>") == std::string::npos) {
        const auto piece = MessageFrame::Judge(frame.substr(0, frame.size() - 2));
        if (piece.verdict != MessageFrame::Verdict::Good || piece.type != "NTV" ||
            piece.payload != ";~1;~7;~" + value + ";~")
            std::abort();
    }
    std::vector<Variant> items;
    for (size_t at = 0; at < input.size() && items.size() < 50; at += 3)
        items.emplace_back(input.substr(at, 3));
    VbArray<Variant> array(0, std::move(items));
    driver->WriteArray(9, array);
    driver->shutdown();
    loop.advance(std::chrono::milliseconds(100));
    return 0;
}
