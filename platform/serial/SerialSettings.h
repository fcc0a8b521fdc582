#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace maroset::platform {

// The line settings of a serial port, parsed once from the settings text the system uses:
// "speed,parity,data bits,stop bits", for example "19200,n,8,1" or "9600,E,7,1.5". Parity is
// one of n(one), e(ven), o(dd), m(ark), s(pace), in either letter case; data bits 5 to 8;
// stop bits 1, 1.5 or 2. Text of any other shape fails with Invalid property value (380), as
// the serial control refuses it.
struct SerialSettings {
    enum class Parity { None, Even, Odd, Mark, Space };
    enum class StopBits { One, OnePointFive, Two };

    int32_t baud = 9600;
    Parity parity = Parity::None;
    int dataBits = 8;
    StopBits stopBits = StopBits::One;

    static SerialSettings Parse(std::string_view text);
    // The settings text, normalised ("19200,n,8,1").
    std::string text() const;

    friend bool operator==(const SerialSettings&, const SerialSettings&) = default;
};

}  // namespace maroset::platform
