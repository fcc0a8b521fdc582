#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace maroset {

// Collects Intech reply frames from the characters of the line, one receive event at a time.
// A frame is "@" up to the first ":" plus exactly two more characters (the BCC); everything
// outside a frame (the carriage return after it, line noise) is dropped.
//
// feed() takes what one receive event read from the port (one character, as the port is set
// up) and returns true when that completed a frame, which RxBuffer() then holds until the
// next "@". The state is the instrument link's own: RxBuffer, Receiving, ColonSeen and
// TrailCount. A new "@" restarts collection but leaves TrailCount alone: after a frame cut
// off one character past its ":", the next frame ends one character early and fails its
// check, and TrailCount is back at 0. That is intended.
//
// A frame is held up to FrameLimit characters, a few times the longest reply an instrument
// sends: a frame that grows past it (a line that never sends its ":") is dropped, and the
// characters up to the next "@" are dropped as outside a frame.
class IntechCollector {
  public:
    static constexpr size_t FrameLimit = 512;

    bool feed(std::string_view c);

    const std::string& RxBuffer() const { return RxBuffer_; }
    bool Receiving() const { return Receiving_; }
    bool ColonSeen() const { return ColonSeen_; }
    int16_t TrailCount() const { return TrailCount_; }

    // Characters dropped outside a frame since the last takeDropped(), carriage returns and
    // line feeds not counted (every reply ends with one), and the first few of them.
    int64_t dropped() const { return dropped_; }
    const std::string& droppedSample() const { return droppedSample_; }
    void takeDropped() {
        dropped_ = 0;
        droppedSample_.clear();
    }

    static constexpr size_t DroppedSampleSize = 16;

    // The frame a new "@" cut short, since the last takeCutShort() (empty when none).
    const std::string& cutShort() const { return cutShort_; }
    void takeCutShort() { cutShort_.clear(); }
    // A frame was dropped for growing past FrameLimit, since the last takeOverrun().
    bool overran() const { return overran_; }
    void takeOverrun() { overran_ = false; }

  private:
    void drop(std::string_view c);

    std::string RxBuffer_;
    bool Receiving_ = false;
    bool ColonSeen_ = false;
    int16_t TrailCount_ = 0;
    int64_t dropped_ = 0;
    std::string droppedSample_;
    std::string cutShort_;
    bool overran_ = false;
};

}  // namespace maroset
