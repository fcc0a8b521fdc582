#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace maroset {

// The frames of the soft-PLC protocol, as the client builds and judges them:
//
//   "<%" + type ("@@@") + number ("000") + ";~" + data + ";~" + MessageCRC(body) + "%>"
//
// where the body is everything before the six CRC digits. The shortest frame (empty data) is
// 20 characters.
class MessageFrame {
  public:
    // The frame of one message. A type shorter than three characters is padded on the left
    // with blanks; data must not hold "%>" (the receiver would split there).
    static std::string Build(std::string_view type, int32_t number, std::string_view data);

    enum class Verdict {
        Empty,     // nothing (what follows the last "%>"): ignored
        TooShort,  // 1 to 10 characters: answered with a NAK
        BadCrc,    // the six digits differ from the body's CRC: answered with a NAK
        Good,
    };
    struct Piece {
        Verdict verdict = Verdict::Empty;
        std::string type;     // characters 3 to 5 of the body
        std::string number;   // characters 6 to 8
        std::string payload;  // the body from character 9 on: ";~" + data + ";~"
    };

    // Judges one piece of received text, cut at "%>" (which it no longer holds). The start
    // delimiter is not looked at: whatever stands in the first two characters passes when the
    // CRC matches, as the server's frames are read.
    static Piece Judge(std::string_view piece);

    static constexpr size_t MinimumPiece = 11;
    static constexpr size_t CrcDigits = 6;
};

}  // namespace maroset
