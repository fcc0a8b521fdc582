#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Clock.h"

namespace maroset::platform {

// What happened on a link. The kind is what readers count and what moves a node's link state;
// the words are only for people, so they are built only when a reader asks for them.
enum class IncidentKind : uint8_t {
    Opening,     // a connect or port open has started             (state: connecting)
    Opened,      // the link is usable: connected, port open        (state: up)
    OpenFailed,  // a connect or open failed, or a driver's start   (state: down)
    Closed,      // we or the peer closed the link                  (state: down)
    Sent,        // a request or frame went out
    Received,    // a good reply or frame came in                   (state: up)
    TimedOut,    // no reply in time                                (state: down)
    Retried,     // a request sent again: NAK received, reply missed
    BadCheck,    // a CRC or BCC mismatch, a malformed frame
    Refused,     // the device answered, but refused or failed the request
    Dropped,     // bytes or a request given up: partial frame, overflow, frame abandoned
    Error,       // a run-time error in a driver procedure (often the same one every tick)
    Note,        // anything else a person should see
};

// The kind's name as readers show it ("opened", "timed-out", ...).
std::string_view IncidentKindName(IncidentKind kind);

// One incident, as the stream hands it to its readers for the length of the call. Readers
// that keep anything copy it.
class LinkIncident {
  public:
    using TextSource = std::function<std::string()>;

    LinkIncident(std::string_view node, IncidentKind kind, std::string_view endpoint,
                 std::string_view tag, DateTime time, const TextSource& text)
        : node_(node), kind_(kind), endpoint_(endpoint), tag_(tag), time_(time), source_(text) {}

    // The node whose link it is (its Name, as the project spells it).
    std::string_view node() const { return node_; }
    IncidentKind kind() const { return kind_; }
    // Where: "host:port" actually used, a device path, an endpoint URL; empty when none.
    std::string_view endpoint() const { return endpoint_; }
    // The tag concerned, by address; empty when none.
    std::string_view tag() const { return tag_; }
    DateTime time() const { return time_; }
    // What happened, in words; built on the first call and kept for the other readers.
    const std::string& text() const;

  private:
    std::string_view node_;
    IncidentKind kind_;
    std::string_view endpoint_;
    std::string_view tag_;
    DateTime time_;
    const TextSource& source_;
    mutable std::optional<std::string> text_;
};

}  // namespace maroset::platform
