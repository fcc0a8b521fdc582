#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>

namespace maroset {

// Cuts the text of one data arrival into pieces at every "%>", as the client reads it: the
// pieces between the delimiters and the rest after the last one (empty when the text ends
// with "%>"), in order, exactly as Split(text, "%>") gives them.
//
// There is deliberately no buffer between arrivals: a frame the transport cut in two is
// judged as two pieces (each answered with a NAK) and the sender's resend recovers it. Use one
// splitter per arrival: feed() the text in any chunking, even byte by byte, then finish().
//
// A piece keeps at most PieceLimit bytes, far more than any frame a server sends: the rest of
// a longer one (a peer that never sends "%>") is not kept, and the piece, judged on what was
// kept, fails its check as the whole would.
class ArrivalSplitter {
  public:
    static constexpr size_t PieceLimit = 256 * 1024;

    void feed(std::string_view chunk);
    void feed(char byte);
    // Ends the arrival: what is left after the last "%>" becomes the last piece.
    void finish();
    // Takes the oldest complete piece; false when there is none.
    bool next(std::string& piece);
    size_t ready() const { return pieces_.size(); }
    // A piece of this arrival was longer than PieceLimit.
    bool overlong() const { return overlong_; }

  private:
    void keep(std::string_view bytes);

    std::string current_;
    bool overlong_ = false;
    bool percent_ = false;  // the last byte fed was a '%' not yet known to start "%>"
    std::deque<std::string> pieces_;
};

}  // namespace maroset
