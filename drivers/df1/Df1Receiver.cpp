#include "drivers/df1/Df1Receiver.h"

#include "core/Procedure.h"

namespace maroset {

Df1Receiver::Df1Receiver(int16_t bufferLimit)
    : BufferLimit(bufferLimit), RxBuffer(0, bufferLimit) {}

void Df1Receiver::Resize(int16_t bufferLimit) {
    RxBuffer.ReDim(0, bufferLimit);
    BufferLimit = bufferLimit;
}

bool Df1Receiver::feed(uint8_t Cur, Link& link, Procedure& proc) {
    if (InMessage) {
        link.restartEndOfMessage();
        if (Cur == DLE && PrevByte == DLE) {
            // The second DLE of a doubled pair: the first is stored already, and this one must
            // not make the next byte look like it follows a DLE.
            Cur = 0;
        } else {
            proc.run([&] { RxBuffer(RxCount) = Cur; });
            if (RxCount < BufferLimit) ++RxCount;  // else the last cell is overwritten, as intended
            if (TrailerLeft > 0) --TrailerLeft;
            if (TrailerLeft == 0 && EtxSeen) {
                EtxSeen = false;
                InMessage = false;
                if (!link.frameReceived()) return false;
                link.stopEndOfMessage();
            }
        }
    }
    if (PrevByte == DLE) {
        if (InMessage && (Cur == ACK || Cur == NAK || Cur == ENQ || Cur == STX)) {
            RxCount = static_cast<int16_t>(RxCount - 2);  // the DLE and the control byte go
            InMessage = false;
            if (RxCount > 2 && !link.frameReceived()) return false;
            link.stopEndOfMessage();
        }
        switch (Cur) {
            case ACK:
            case NAK:
            case ENQ:
                if (!link.controlReceived(Cur)) return false;
                break;
            case STX:
                InMessage = true;
                RxCount = 0;
                EtxSeen = false;
                link.frameStarted();
                break;
            case ETX:
                TrailerLeft = 2;  // always two check bytes, as intended
                EtxSeen = true;
                break;
            default:
                break;
        }
    }
    PrevByte = Cur;
    return true;
}

}  // namespace maroset
