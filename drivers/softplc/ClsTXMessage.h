#pragma once

#include <cstdint>
#include <string>

namespace maroset {

// One frame the client sent and keeps until the server acknowledges it.
class ClsTXMessage {
  public:
    std::string Message;        // the whole frame as sent, "<%" through "%>"
    int16_t SckIndex = 0;       // declared, never used
    int32_t MSGNum = 0;         // the frame's message number
    int32_t AckDelayCount = 0;  // timer ticks since it was (re)sent
    int32_t NakCount = 0;       // resends, on silence or on a NAK
};

}  // namespace maroset
