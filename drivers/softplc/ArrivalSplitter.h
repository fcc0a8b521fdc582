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
class ArrivalSplitter {
  public:
    void feed(std::string_view chunk);
    void feed(char byte);
    // Ends the arrival: what is left after the last "%>" becomes the last piece.
    void finish();
    // Takes the oldest complete piece; false when there is none.
    bool next(std::string& piece);
    size_t ready() const { return pieces_.size(); }

  private:
    std::string current_;
    bool percent_ = false;  // the last byte fed was a '%' not yet known to start "%>"
    std::deque<std::string> pieces_;
};

}  // namespace maroset
