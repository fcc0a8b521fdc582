#pragma once

#include <functional>
#include <map>
#include <string>
#include <string_view>

#include "lang/Subscription.h"
#include "platform/Clock.h"
#include "platform/LinkIncidents.h"

namespace maroset {

// The link trace a person reads: a reader of the link incidents that turns each one into the
// line "NODE: HH:MM:SS.mmm TEXT" (local time to the millisecond, from the incident) and hands
// it to a sink (`maroset run --trace` prints it after "trace " on standard error).
//
// Frames, NAKs, time-outs, retries, bad checks, drops, connects and closes are one line each.
// An incident that tends to come back on every scan tick (an error, a failed open, a refused
// request, a note) is printed the first time; while the same words keep coming for the node,
// it is summarised once every 10 s as "TEXT ... repeated N times". The node's link opening
// again ends every such run, with a last summary of what was left unsaid.
class TracePrinter {
  public:
    using Sink = std::function<void(std::string_view line)>;

    static constexpr platform::DateTime::duration SummaryEvery = std::chrono::seconds(10);

    TracePrinter(platform::LinkIncidents& incidents, Sink sink);
    TracePrinter(const TracePrinter&) = delete;
    TracePrinter& operator=(const TracePrinter&) = delete;

    // "HH:MM:SS.mmm" of a local time.
    static std::string TimeOfDay(platform::DateTime t);

  private:
    struct Run {
        long repeats = 0;  // since the last line about it
        platform::DateTime lastLine;
    };
    // The runs of one node, by their words.
    using Runs = std::map<std::string, Run, std::less<>>;

    void read(const platform::LinkIncident& incident);
    void print(std::string_view node, platform::DateTime when, std::string_view text);
    void summarise(std::string_view node, platform::DateTime when, std::string_view text, Run& run);
    void endRuns(std::string_view node, platform::DateTime when);

    Sink sink_;
    // Keyed by node name as reported.
    std::map<std::string, Runs, std::less<>> runs_;
    Subscription reading_;
};

}  // namespace maroset
