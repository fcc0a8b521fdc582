// What arrives on a DF1 line is whatever the cable, the PLC or a noisy adapter makes of it:
// arbitrary bytes in arbitrary pieces with arbitrary gaps, while the host keeps polling. The
// port owner must neither crash nor hang, and the first good exchange afterwards must work.
//
// Input: records [control][length][bytes...]. control & 0x3F: milliseconds of silence after
// the piece (gaps over 15 ms drop a frame); control & 0x40: the host polls before the piece;
// length % 24 + 1: bytes in the piece. The first byte sets the word count (0..31).
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>

#include "core/Crc16Arc.h"
#include "core/Runtime.h"
#include "core/ScopedRuntime.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "lang/VbError.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

#include "SerialFuzzLine.h"

namespace {

using namespace maroset;
using namespace std::chrono_literals;

std::string Frame(const std::string& body) {
    std::string out{0x10, 0x02};
    for (const char c : body) {
        out += c;
        if (c == 0x10) out += c;
    }
    const uint16_t crc = crc16arc::Fold(3, crc16arc::Fold(body));
    return out +
           std::string{0x10, 0x03, static_cast<char>(crc & 0xFF), static_cast<char>(crc >> 8)};
}


}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 1) return 0;
    static fuzz::SerialFuzzLine line;
    platform::VirtualEventLoop& loop = *line.loop;
    platform::MemorySerialCable& cable = line.cable;

    const uint8_t words = data[0] % 32;
    FrmNUVProSerial owner("PLC");
    owner.PLCNode(1);
    owner.PLCWordCount(words);
    owner.PLCAddress(Variant("N7:0"));
    owner.PLCFunction(Variant(int16_t{1}));
    int reads = 0;
    VbArray<Variant> last;
    auto sub = owner.ReadComplete.subscribe([&](VbArray<Variant>& v) {
        ++reads;
        last = v;
    });
    auto poll = [&] {
        try {
            owner.RefreshData();
        } catch (const VbError&) {
            abort();  // a good address and an open line: a request always goes out
        }
    };

    for (size_t i = 1; i + 1 < size;) {
        const uint8_t control = data[i];
        const size_t length = data[i + 1] % 24 + 1;
        i += 2;
        const std::string piece(reinterpret_cast<const char*>(data + i),
                                std::min(length, size - i));
        i += piece.size();
        if (control & 0x40) poll();
        cable.deviceEnd()->write(piece);
        loop.advance(std::chrono::milliseconds(control & 0x3F));
    }

    // Whatever the line did, the link settles within the time-outs, and a host that keeps
    // polling is answered: a poll may find the last exchange unfinished and only clear it.
    loop.advance(5000ms);
    cable.takeHostSent();
    poll();
    if (cable.takeHostSent().empty()) {
        poll();
        if (cable.takeHostSent().empty()) abort();
    }
    std::string body{0, 1, 0x4F, 0, 0, 0};
    for (int w = 0; w < words; ++w) body += std::string{static_cast<char>(w), 0x10};
    const int before = reads;
    cable.deviceEnd()->write(std::string{0x10, 0x06} + Frame(body));
    loop.advance(0ms);
    if (reads != before + 1 || owner.Busy()) abort();
    for (int w = 0; w < words; ++w) {
        if (!(last(w) == Variant(static_cast<int16_t>(0x1000 + w)))) abort();
    }
    cable.takeHostSent();  // the ACK of that reply
    cable.takeDeviceSent();
    return 0;
}
