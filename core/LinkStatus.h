#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/Clock.h"

namespace maroset {

// The state of a node's link, as a person asks "is it talking?".
enum class LinkState : uint8_t {
    Local,       // memory and disk tags: no link to a device
    Connecting,  // started, no answer yet (or a connect under way)
    Up,          // the device answers
    Down,        // the device does not answer, the link is closed, or the driver did not start
};

// "local", "connecting", "up", "down".
std::string_view LinkStateName(LinkState state);

// Counts since the node was started; they only grow.
struct LinkCounters {
    uint64_t requests = 0;      // requests and frames sent
    uint64_t replies = 0;       // good replies and frames received
    uint64_t timeouts = 0;      // replies that did not come in time
    uint64_t retries = 0;       // requests sent again (NAKs, missed replies)
    uint64_t badChecks = 0;     // CRC or BCC mismatches, malformed frames
    uint64_t reconnects = 0;    // times the link came back after it was lost
    uint64_t values = 0;        // values reported to the host
    uint64_t driverErrors = 0;  // error reports raised to the host
};

// The latest incident worth a person's attention (not a routine frame sent or received).
struct LinkIncidentRecord {
    std::string text;
    platform::DateTime time;
};

// A snapshot of one node's link.
struct LinkStatus {
    std::string node;    // the node's Name
    std::string driver;  // the driver type key ("NUVABDF1", "MEMTAG", ...)
    std::string endpoint;  // the last endpoint an incident named; empty until one does
    LinkState state = LinkState::Connecting;
    platform::DateTime since{};  // when the state last changed
    LinkCounters counters;
    std::optional<LinkIncidentRecord> last;
};

}  // namespace maroset
