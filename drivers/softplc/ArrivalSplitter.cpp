#include "drivers/softplc/ArrivalSplitter.h"

namespace maroset {

void ArrivalSplitter::feed(char byte) {
    if (percent_) {
        percent_ = false;
        if (byte == '>') {
            pieces_.push_back(std::move(current_));
            current_.clear();
            return;
        }
        keep("%");
    }
    if (byte == '%')
        percent_ = true;
    else
        keep(std::string_view(&byte, 1));
}

void ArrivalSplitter::keep(std::string_view bytes) {
    const size_t room = PieceLimit - current_.size();
    if (bytes.size() > room) {
        overlong_ = true;
        bytes = bytes.substr(0, room);
    }
    current_.append(bytes);
}

void ArrivalSplitter::feed(std::string_view chunk) {
    // A '%' left from the previous chunk may pair with this chunk's first byte.
    while (percent_ && !chunk.empty()) {
        feed(chunk.front());
        chunk.remove_prefix(1);
    }
    while (!chunk.empty()) {
        const size_t at = chunk.find("%>");
        if (at == std::string_view::npos) {
            // A trailing '%' may still start a delimiter with the next chunk.
            if (chunk.back() == '%') {
                keep(chunk.substr(0, chunk.size() - 1));
                percent_ = true;
            } else {
                keep(chunk);
            }
            return;
        }
        keep(chunk.substr(0, at));
        pieces_.push_back(std::move(current_));
        current_.clear();
        chunk.remove_prefix(at + 2);
    }
}

void ArrivalSplitter::finish() {
    if (percent_) keep("%");
    percent_ = false;
    pieces_.push_back(std::move(current_));
    current_.clear();
}

bool ArrivalSplitter::next(std::string& piece) {
    if (pieces_.empty()) return false;
    piece = std::move(pieces_.front());
    pieces_.pop_front();
    return true;
}

}  // namespace maroset
