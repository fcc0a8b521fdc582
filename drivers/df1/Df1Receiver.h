#pragma once

#include <cstdint>

#include "lang/VbArray.h"

namespace maroset {

class Procedure;

// The receive half of the DF1 full-duplex link, stepped one byte at a time: it hunts for
// DLE STX, stores the frame from DST onward (the DLE before ETX, the ETX and the two check
// bytes included), takes a doubled DLE as one data byte, and spots the link replies DLE ACK,
// DLE NAK and DLE ENQ. What a byte means for the link (restart the end-of-message count, check
// a finished frame, react to ACK/NAK/ENQ) is asked of the Link that feeds it, in the order the
// steps reach it.
//
// Deliberate quirks, kept as the port owner has always worked:
// - two check bytes are always awaited after DLE ETX, whatever the error check mode says;
// - bytes beyond BufferLimit keep overwriting the last cell of RxBuffer;
// - a DLE ACK, NAK, ENQ or STX inside a frame drops those two bytes and ends the frame, which
//   is still checked when more than two bytes are left;
// - after a doubled DLE the previous byte counts as 0, so the next byte never follows a DLE.
// An index outside RxBuffer (a buffer re-dimensioned under a frame) fails with Subscript out
// of range (9) through the caller's procedure, never past the buffer.
class Df1Receiver {
  public:
    static constexpr uint8_t DLE = 16, STX = 2, ETX = 3, ENQ = 5, ACK = 6, NAK = 21;

    // The owner's side of each step. The calls that can raise events return false when the
    // owner is gone afterwards (a host dropped the node meanwhile): feed then returns at once,
    // without touching the receiver again.
    class Link {
      public:
        virtual void restartEndOfMessage() = 0;
        virtual void stopEndOfMessage() = 0;
        // RxBuffer holds a finished frame of RxCount bytes.
        virtual bool frameReceived() = 0;
        // DLE followed by ACK, NAK or ENQ.
        virtual bool controlReceived(uint8_t code) = 0;
        // DLE STX: a new frame starts.
        virtual void frameStarted() {}

      protected:
        ~Link() = default;
    };

    explicit Df1Receiver(int16_t bufferLimit = 19);

    // RxBuffer re-dimensioned to 0..limit (contents cleared, RxCount kept).
    void Resize(int16_t bufferLimit);

    // Steps one received byte. Statements that can fail run through `proc`, the trap of the
    // receive-event procedure. Returns false when the owner went away during the step.
    bool feed(uint8_t Cur, Link& link, Procedure& proc);

    bool InMessage = false;
    bool EtxSeen = false;
    int16_t TrailerLeft = 0;
    uint8_t PrevByte = 0;
    int16_t BufferLimit;
    int16_t RxCount = 0;
    VbArray<uint8_t> RxBuffer;
};

}  // namespace maroset
