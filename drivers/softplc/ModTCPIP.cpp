#include "drivers/softplc/ModTCPIP.h"

#include "core/Crc16Arc.h"
#include "core/Procedure.h"

namespace maroset::ModTCPIP {

namespace {

constexpr const char* kModule = "ModServer";
constexpr uint8_t kEtx = 3;

// A byte as "000" formats it.
void appendThreeDigits(std::string& out, uint8_t value) {
    out += static_cast<char>('0' + value / 100);
    out += static_cast<char>('0' + value / 10 % 10);
    out += static_cast<char>('0' + value % 10);
}

}  // namespace

std::string MessageCRC(std::string_view message) {
    Procedure proc(kModule, "MessageCRC");
    std::string digits;
    proc.run([&] {
        uint16_t crc = crc16arc::Fold(message, 0);
        CRCThisByte(kEtx, crc);  // the virtual ETX, as the server's check expects
        digits.reserve(6);
        appendThreeDigits(digits, WordToByte(crc, true));
        appendThreeDigits(digits, WordToByte(crc, false));
    });
    return digits;
}

uint16_t CRCThisByte(uint8_t value, uint16_t& crc) {
    crc = crc16arc::Fold(value, crc);
    return crc;
}

uint8_t WordToByte(uint16_t value, bool high) {
    return static_cast<uint8_t>(high ? value >> 8 : value & 0xFF);
}

}  // namespace maroset::ModTCPIP
