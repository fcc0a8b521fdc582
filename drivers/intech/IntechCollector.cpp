#include "drivers/intech/IntechCollector.h"

namespace maroset {

bool IntechCollector::feed(std::string_view c) {
    if (c == "@") {
        if (Receiving_) cutShort_.swap(RxBuffer_);
        RxBuffer_.clear();
        Receiving_ = true;
        ColonSeen_ = false;  // TrailCount is not reset here, on purpose
    }
    if (!Receiving_) {
        drop(c);
        return false;
    }
    bool complete = false;
    if (RxBuffer_.size() + c.size() > FrameLimit) {
        RxBuffer_.clear();
        Receiving_ = false;
        ColonSeen_ = false;
        overran_ = true;
        drop(c);
        return false;
    }
    RxBuffer_.append(c);
    if (ColonSeen_) {
        ++TrailCount_;
        if (TrailCount_ == 2) {
            Receiving_ = false;
            TrailCount_ = 0;
            complete = true;
        }
    }
    if (c == ":") ColonSeen_ = true;
    return complete;
}

void IntechCollector::drop(std::string_view c) {
    for (const char ch : c) {
        if (ch == '\r' || ch == '\n') continue;
        ++dropped_;
        if (droppedSample_.size() < DroppedSampleSize) droppedSample_ += ch;
    }
}

}  // namespace maroset
