#include "core/LinkStatusBoard.h"

#include <algorithm>
#include <utility>

#include "lang/Strings.h"

namespace maroset {

using platform::IncidentKind;

std::string_view LinkStateName(LinkState state) {
    switch (state) {
        case LinkState::Local: return "local";
        case LinkState::Connecting: return "connecting";
        case LinkState::Up: return "up";
        case LinkState::Down: return "down";
    }
    return "down";
}

namespace {

bool isLocalDriver(std::string_view type) {
    return type == "MEMTAG" || type == "DISKTAG";
}

}  // namespace

LinkStatusBoard::LinkStatusBoard(platform::LinkIncidents& incidents, ReportTap& reports,
                                 const platform::Clock& clock)
    : clock_(clock),
      reading_(incidents.subscribe([this](const platform::LinkIncident& i) { read(i); })),
      countingValues_(reports.Values.subscribe(
          [this](std::string_view node, const VbArray<int32_t>&, int16_t count,
                 const VbArray<Variant>&) {
              if (Entry* e = entry(node); e && count > 0) e->status.counters.values += count;
          })),
      countingErrors_(reports.Errors.subscribe(
          [this](std::string_view node, const std::string&, const std::string&,
                 const std::string&) {
              if (Entry* e = entry(node)) ++e->status.counters.driverErrors;
          })) {}

std::vector<LinkStatus> LinkStatusBoard::All() const {
    std::vector<LinkStatus> all;
    all.reserve(entries_.size());
    for (const auto& [key, e] : entries_) all.push_back(e.status);
    return all;
}

const LinkStatus* LinkStatusBoard::Find(std::string_view node) const {
    const auto it = entries_.find(UCase(std::string(node)));
    return it == entries_.end() ? nullptr : &it->second.status;
}

LinkStatusBoard::Entry* LinkStatusBoard::entry(std::string_view node) {
    const auto it = entries_.find(UCase(std::string(node)));
    return it == entries_.end() ? nullptr : &it->second;
}

LinkStatusBoard::StartScope::StartScope(LinkStatusBoard& board, std::string_view node,
                                        const void* owner)
    : board_(board), node_(node), previous_(std::exchange(board.starting_, UCase(node_))) {
    Entry e;
    e.owner = owner;
    e.status.node = node_;
    e.status.since = board.clock_.now();
    board.entries_[board.starting_] = std::move(e);
}

LinkStatusBoard::StartScope::~StartScope() {
    board_.starting_ = std::move(previous_);
}

void LinkStatusBoard::StartScope::typeKnown(std::string_view driverType) {
    Entry* e = board_.entry(node_);
    if (!e) return;
    e->status.driver = std::string(driverType);
    if (isLocalDriver(driverType) && e->status.state == LinkState::Connecting) {
        e->status.state = LinkState::Local;
    }
}

void LinkStatusBoard::StartError(const VbError& error) {
    if (starting_.empty()) return;
    const auto it = entries_.find(starting_);
    if (it == entries_.end()) return;
    const auto now = clock_.now();
    remember(it->second, "did not start: error " + std::to_string(error.number()) + " " +
                             error.description(), now);
    moveTo(it->second, LinkState::Down, now);
}

void LinkStatusBoard::NodeGone(std::string_view node, const void* owner) {
    const auto it = entries_.find(UCase(std::string(node)));
    if (it != entries_.end() && it->second.owner == owner) entries_.erase(it);
}

void LinkStatusBoard::read(const platform::LinkIncident& incident) {
    Entry* e = entry(incident.node());
    if (!e) return;
    LinkCounters& c = e->status.counters;
    if (!incident.endpoint().empty() && incident.endpoint() != e->status.endpoint) {
        e->status.endpoint = std::string(incident.endpoint());
    }
    const auto kind = incident.kind();
    switch (kind) {
        case IncidentKind::Sent: ++c.requests; break;
        case IncidentKind::Received: ++c.replies; break;
        case IncidentKind::TimedOut: ++c.timeouts; break;
        case IncidentKind::Retried: ++c.retries; break;
        case IncidentKind::BadCheck: ++c.badChecks; break;
        default: break;
    }
    // Routine traffic is counted, not remembered: the last incident is what a person wants.
    if (kind != IncidentKind::Sent && kind != IncidentKind::Received) {
        remember(*e, incident.text(), incident.time());
    }
    if (e->status.state == LinkState::Local) return;
    switch (kind) {
        case IncidentKind::Opening: moveTo(*e, LinkState::Connecting, incident.time()); break;
        case IncidentKind::Opened:
        case IncidentKind::Received: moveTo(*e, LinkState::Up, incident.time()); break;
        case IncidentKind::OpenFailed:
        case IncidentKind::Closed:
        case IncidentKind::TimedOut: moveTo(*e, LinkState::Down, incident.time()); break;
        default: break;
    }
}

void LinkStatusBoard::moveTo(Entry& e, LinkState state, platform::DateTime when) {
    if (e.status.state == state) return;
    if (state == LinkState::Up) {
        if (e.lost) ++e.status.counters.reconnects;
        e.everUp = true;
        e.lost = false;
    } else if (state == LinkState::Down && e.everUp) {
        e.lost = true;
    }
    e.status.state = state;
    e.status.since = when;
    // A copy: a handler may start or remove nodes, which changes the map.
    const LinkStatus snapshot = e.status;
    StateChanged.raise(snapshot);
}

void LinkStatusBoard::remember(Entry& e, std::string text, platform::DateTime when) {
    e.status.last = LinkIncidentRecord{std::move(text), when};
}

}  // namespace maroset
