#pragma once

#include <cstdint>
#include <string_view>

namespace maroset::crc16arc {

// CRC-16/ARC: reflected polynomial 0xA001, initial value 0, no final XOR (check value 0xBB3D
// for "123456789"). The DF1 link and the soft-PLC frames both check with it, each over its
// own bytes and with its own rendering.

// Folds one byte into a running CRC: the byte is XORed into the low byte, then eight shifts
// right, each followed by XOR 0xA001 when the bit shifted out was 1.
uint16_t Fold(uint8_t byte, uint16_t crc);
// Folds every byte of `bytes`, in order, into `crc`.
uint16_t Fold(std::string_view bytes, uint16_t crc = 0);

}  // namespace maroset::crc16arc
