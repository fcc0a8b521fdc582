#include "core/TracePrinter.h"

#include <cstdio>

namespace maroset {

using platform::IncidentKind;

namespace {

// What tends to come back on every tick with the same words; protocol incidents never do.
bool recurs(IncidentKind kind) {
    switch (kind) {
        case IncidentKind::Opening:
        case IncidentKind::OpenFailed:
        case IncidentKind::Refused:
        case IncidentKind::Error:
        case IncidentKind::Note:
            return true;
        default:
            return false;
    }
}

// Runs kept per node at most: a node cycling through more distinct failures than this is
// printed in full rather than remembered without end.
constexpr size_t kRunsPerNode = 16;

}  // namespace

TracePrinter::TracePrinter(platform::LinkIncidents& incidents, Sink sink)
    : sink_(std::move(sink)),
      reading_(incidents.subscribe([this](const platform::LinkIncident& i) { read(i); })) {}

std::string TracePrinter::TimeOfDay(platform::DateTime t) {
    const auto day = std::chrono::floor<std::chrono::days>(t);
    const std::chrono::hh_mm_ss<std::chrono::milliseconds> hms(t - day);
    char out[16];
    std::snprintf(out, sizeof out, "%02d:%02d:%02d.%03d", static_cast<int>(hms.hours().count()),
                  static_cast<int>(hms.minutes().count()), static_cast<int>(hms.seconds().count()),
                  static_cast<int>(hms.subseconds().count()));
    return out;
}

void TracePrinter::read(const platform::LinkIncident& incident) {
    const std::string_view node = incident.node();
    const auto when = incident.time();
    if (incident.kind() == IncidentKind::Opened) endRuns(node, when);
    if (!recurs(incident.kind())) {
        print(node, when, incident.text());
        return;
    }
    const std::string& text = incident.text();
    auto nodeRuns = runs_.find(node);
    if (nodeRuns == runs_.end()) nodeRuns = runs_.emplace(std::string(node), Runs{}).first;
    Runs& runs = nodeRuns->second;
    if (const auto it = runs.find(text); it != runs.end()) {
        Run& run = it->second;
        ++run.repeats;
        if (when - run.lastLine >= SummaryEvery) summarise(node, when, text, run);
        return;
    }
    if (runs.size() < kRunsPerNode) runs.emplace(text, Run{0, when});
    print(node, when, text);
}

void TracePrinter::print(std::string_view node, platform::DateTime when, std::string_view text) {
    std::string line;
    line.reserve(node.size() + 15 + text.size());
    line.append(node).append(": ").append(TimeOfDay(when)).append(" ").append(text);
    sink_(line);
}

void TracePrinter::summarise(std::string_view node, platform::DateTime when, std::string_view text,
                             Run& run) {
    print(node, when,
          std::string(text) + " ... repeated " + std::to_string(run.repeats) + " times");
    run.repeats = 0;
    run.lastLine = when;
}

void TracePrinter::endRuns(std::string_view node, platform::DateTime when) {
    const auto it = runs_.find(node);
    if (it == runs_.end()) return;
    Runs runs = std::move(it->second);
    runs_.erase(it);
    for (auto& [text, run] : runs)
        if (run.repeats > 0) summarise(node, when, text, run);
}

}  // namespace maroset
