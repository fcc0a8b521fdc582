#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace maroset::ModTCPIP {

// The check of the soft-PLC frames: CRC-16/ARC (core/Crc16Arc.h) over the frame's body plus
// one ETX byte (3) that is never sent, rendered as six decimal digits, the high byte and then
// the low byte, three digits each ("003242" for 0x03F2). The routines log as "ModServer".

// The six CRC digits of a body ("<%" through the second ";~").
std::string MessageCRC(std::string_view message);
// Folds one byte into the running CRC, updates it in place and returns it.
uint16_t CRCThisByte(uint8_t value, uint16_t& crc);
// The high byte of value when `high`, else the low byte.
uint8_t WordToByte(uint16_t value, bool high);

}  // namespace maroset::ModTCPIP
