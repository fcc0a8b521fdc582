#include "gateway/PrometheusText.h"

#include <cstdint>

namespace maroset::gateway {

namespace {

// A label value: the library's Latin-1 text as UTF-8, with \, " and newline escaped.
std::string label(const std::string& bytes) {
    std::string out;
    for (const char ch : bytes) {
        const auto b = static_cast<unsigned char>(ch);
        if (ch == '\\' || ch == '"') {
            out += '\\';
            out += ch;
        } else if (ch == '\n') {
            out += "\\n";
        } else if (b >= 0x80) {
            out += static_cast<char>(0xC0 | (b >> 6));
            out += static_cast<char>(0x80 | (b & 0x3F));
        } else {
            out += ch;
        }
    }
    return out;
}

struct Family {
    const char* name;
    const char* help;
    uint64_t LinkCounters::*counter;
};

constexpr Family kCounters[] = {
    {"maroset_link_requests_total", "Requests and frames sent.", &LinkCounters::requests},
    {"maroset_link_replies_total", "Good replies and frames received.", &LinkCounters::replies},
    {"maroset_link_timeouts_total", "Replies that did not come in time.", &LinkCounters::timeouts},
    {"maroset_link_retries_total", "Requests sent again (NAKs, missed replies).",
     &LinkCounters::retries},
    {"maroset_link_bad_checks_total", "CRC or BCC mismatches and malformed frames.",
     &LinkCounters::badChecks},
    {"maroset_link_reconnects_total", "Times the link came back after it was lost.",
     &LinkCounters::reconnects},
    {"maroset_values_total", "Values reported to the host.", &LinkCounters::values},
    {"maroset_driver_errors_total", "Driver errors raised to the host.",
     &LinkCounters::driverErrors},
};

constexpr LinkState kStates[] = {LinkState::Local, LinkState::Connecting, LinkState::Up,
                                 LinkState::Down};

}  // namespace

std::string PrometheusText::Render(const std::vector<LinkStatus>& nodes) {
    std::vector<std::string> labels;
    for (const LinkStatus& s : nodes)
        labels.push_back("node=\"" + label(s.node) + "\",driver=\"" + label(s.driver) + "\"");
    std::string out;
    for (const Family& f : kCounters) {
        out += std::string("# HELP ") + f.name + " " + f.help + "\n";
        out += std::string("# TYPE ") + f.name + " counter\n";
        for (size_t i = 0; i < nodes.size(); ++i)
            out += std::string(f.name) + "{" + labels[i] + "} " +
                   std::to_string(nodes[i].counters.*f.counter) + "\n";
    }
    out += "# HELP maroset_link_state The node's link state (1 for the present one).\n";
    out += "# TYPE maroset_link_state gauge\n";
    for (size_t i = 0; i < nodes.size(); ++i) {
        for (const LinkState state : kStates) {
            out += "maroset_link_state{" + labels[i] + ",state=\"" +
                   std::string(LinkStateName(state)) + "\"} " +
                   (nodes[i].state == state ? "1" : "0") + "\n";
        }
    }
    return out;
}

}  // namespace maroset::gateway
