#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace maroset::platform {

// Where the drivers tell what happens on their links that the system otherwise swallows:
// frames sent and received, NAKs, time-outs, bad checks, failed requests. Off unless a host
// gives it a sink (`maroset run --trace` prints to standard error); drivers test enabled()
// before they build a line, so tracing costs nothing while it is off.
//
// A line is "<source>: <text>"; the source is the node's name, so lines of several nodes
// on one host can be told apart.
class LinkTrace {
  public:
    using Sink = std::function<void(std::string_view line)>;

    bool enabled() const { return static_cast<bool>(sink_); }
    void setSink(Sink sink) { sink_ = std::move(sink); }

    void write(std::string_view source, std::string_view text) const;

    // Bytes as hexadecimal pairs separated by blanks ("10 02 01 00").
    static std::string Hex(std::string_view bytes);
    // Text with control characters and bytes from 0x7F up shown as <CR>, <0x05>, ...
    static std::string Printable(std::string_view text);

  private:
    Sink sink_;
};

}  // namespace maroset::platform
