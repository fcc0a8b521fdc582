#include "core/Crc16Arc.h"

#include <gtest/gtest.h>

namespace maroset {
namespace {

TEST(Crc16Arc, MatchesTheStandardCheckValueAndTheBitwiseDefinition) {
    EXPECT_EQ(crc16arc::Fold("123456789"), 0xBB3D);
    // The definition, one bit at a time, against the table for every byte and many states.
    for (uint32_t crc = 0; crc < 0x10000; crc += 0x0101) {
        for (int b = 0; b < 256; ++b) {
            uint16_t slow = static_cast<uint16_t>((crc & 0xFF00) + ((crc & 0xFF) ^ b));
            for (int i = 0; i < 8; ++i) slow = (slow & 1) ? (slow >> 1) ^ 0xA001 : slow >> 1;
            ASSERT_EQ(crc16arc::Fold(static_cast<uint8_t>(b), static_cast<uint16_t>(crc)), slow);
        }
    }
    // A soft-PLC frame body with its virtual ETX, and a DF1 body with its ETX.
    EXPECT_EQ(crc16arc::Fold(std::string_view("<%TSL001;~ ;~\x03")), 0x03F2);
    EXPECT_EQ(crc16arc::Fold(std::string_view("<%ACK002;~005;~\x03")), 0xC69E);
}

}  // namespace
}  // namespace maroset
