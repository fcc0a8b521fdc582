#pragma once

#include <chrono>
#include <initializer_list>
#include <string>
#include <vector>

#include "core/Crc16Arc.h"
#include "platform/serial/MemorySerialCable.h"
#include "support/RuntimeFixture.h"

namespace maroset::test {

using namespace std::chrono_literals;

inline std::string Bytes(std::initializer_list<int> list) {
    std::string out;
    for (const int b : list) out += static_cast<char>(b);
    return out;
}

// A frame as a PLC puts it on the line: DLE STX, the body with DLEs doubled, DLE ETX, then the
// CRC-16 of body and ETX, low byte first.
inline std::string Df1Frame(const std::string& body) {
    std::string out = Bytes({0x10, 0x02});
    for (const char c : body) {
        out += c;
        if (c == 0x10) out += c;
    }
    const uint16_t crc = crc16arc::Fold(3, crc16arc::Fold(body));
    return out + Bytes({0x10, 0x03, crc & 0xFF, crc >> 8});
}

// The body of a read reply: DST 0, SRC 1, CMD 0x4F, STS 0, TNS, then the words low byte first.
inline std::string ReadReply(int tns, const std::vector<int>& words) {
    std::string body = Bytes({0, 1, 0x4F, 0, tns & 0xFF, (tns >> 8) & 0xFF});
    for (const int w : words) body += Bytes({w & 0xFF, (w >> 8) & 0xFF});
    return body;
}

// A fresh runtime on the virtual clock whose serial port 1 (/dev/ttyS0) is an in-memory cable.
// The test speaks for the PLC through the cable's device end.
class Df1LineFixture : public RuntimeFixture {
  protected:
    Df1LineFixture() { runtime().serialDevices().plug("/dev/ttyS0", cable.hostEnd()); }

    // Everything the host wrote since the last call.
    std::string hostSent() { return cable.takeHostSent(); }
    // The PLC's bytes, delivered at once (one turn of the loop).
    void plcSends(const std::string& bytes) {
        cable.deviceEnd()->write(bytes);
        advance(0ms);
    }

    platform::MemorySerialCable cable{loop()};
};

}  // namespace maroset::test
