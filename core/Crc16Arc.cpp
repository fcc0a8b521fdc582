#include "core/Crc16Arc.h"

#include <array>

namespace maroset::crc16arc {

namespace {

// The eight shifts of one byte, worked out once for every value of the low byte.
constexpr std::array<uint16_t, 256> kTable = [] {
    std::array<uint16_t, 256> table{};
    for (uint16_t i = 0; i < 256; ++i) {
        uint16_t crc = i;
        for (int bit = 0; bit < 8; ++bit) crc = (crc & 1) ? (crc >> 1) ^ 0xA001 : crc >> 1;
        table[i] = crc;
    }
    return table;
}();

}  // namespace

uint16_t Fold(uint8_t byte, uint16_t crc) {
    return static_cast<uint16_t>((crc >> 8) ^ kTable[(crc ^ byte) & 0xFF]);
}

uint16_t Fold(std::string_view bytes, uint16_t crc) {
    for (const char c : bytes) crc = Fold(static_cast<uint8_t>(c), crc);
    return crc;
}

}  // namespace maroset::crc16arc
