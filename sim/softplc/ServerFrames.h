#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>
#include <string_view>

namespace maroset::sim {

// The soft-PLC frames as the server side writes and reads them, written apart from the
// client's own code so the two cannot share a mistake (only the CRC-16/ARC fold is common):
//
//   "<%" TYPE NNN ";~" data ";~" HHHLLL "%>"
//
// HHHLLL is the CRC of everything before it plus a virtual ETX (3), high byte then low byte
// in three decimal digits each.
struct ServerFrame {
    std::string type;
    int32_t number = 0;
    std::string data;

    // The whole frame.
    static std::string Write(std::string_view type, int32_t number, std::string_view data);
    // The six check digits of a body.
    static std::string Check(std::string_view body);
    // One unit as the reader cut it (everything before its "%>"): the frame, or nothing when
    // it is malformed or fails its check.
    static std::optional<ServerFrame> Read(std::string_view unit);
};

// Cuts the byte stream from one client into units at "%>". Unlike the client, the server
// reads a stream: a frame that arrives in pieces is put back together. Text that runs past
// MaxUnit without a "%>" is thrown away as one bad unit, so a client that never ends a frame
// cannot make it grow without bound.
class ServerFrameReader {
  public:
    static constexpr size_t MaxUnit = 64 * 1024;

    void feed(std::string_view bytes);
    // The next unit (without its "%>"); false when none is complete.
    bool next(std::string& unit);

  private:
    std::string partial_;
    std::deque<std::string> units_;
};

}  // namespace maroset::sim
