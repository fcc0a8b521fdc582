#include "core/TracePrinter.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using platform::IncidentKind;

// The printer on the fixture's virtual clock (3/7/2026 9:00:00 AM), its lines recorded.
class TracePrinting : public test::RuntimeFixture {
  protected:
    void tell(std::string_view node, IncidentKind kind, const std::string& text) {
        runtime().incidents().report(node, kind, "/dev/ttyS0", [&] { return text; });
    }

    std::vector<std::string> lines;
    TracePrinter printer{runtime().incidents(),
                         [this](std::string_view line) { lines.emplace_back(line); }};
};

TEST_F(TracePrinting, EachLineCarriesTheNodeThenTheLocalTimeToTheMillisecond) {
    tell("Line1", IncidentKind::Sent, "sent 10 05");
    advance(3'723'045ms);
    tell("Line1", IncidentKind::Received, "received 10 06");
    EXPECT_EQ(lines, (std::vector<std::string>{"Line1: 09:00:00.000 sent 10 05",
                                               "Line1: 10:02:03.045 received 10 06"}));
}

TEST_F(TracePrinting, AnErrorOfEveryTickIsPrintedOnceThenSummarisedEveryTenSeconds) {
    for (int tick = 0; tick < 25; ++tick) {
        tell("Meter", IncidentKind::Error,
             "error 9 in Maroset.FrmNUVIntech: Subscript out of range");
        advance(1s);
    }
    const std::string text = "error 9 in Maroset.FrmNUVIntech: Subscript out of range";
    EXPECT_EQ(lines,
              (std::vector<std::string>{"Meter: 09:00:00.000 " + text,
                                        "Meter: 09:00:10.000 " + text + " ... repeated 10 times",
                                        "Meter: 09:00:20.000 " + text + " ... repeated 10 times"}));

    // The link coming back ends the run with what was left unsaid.
    lines.clear();
    tell("Meter", IncidentKind::Opened, "opened port 1");
    EXPECT_EQ(lines,
              (std::vector<std::string>{"Meter: 09:00:25.000 " + text + " ... repeated 4 times",
                                        "Meter: 09:00:25.000 opened port 1"}));
    lines.clear();
    tell("Meter", IncidentKind::Error, text);
    EXPECT_EQ(lines, std::vector<std::string>{"Meter: 09:00:25.000 " + text}) << "a new run";
}

TEST_F(TracePrinting, RunsAreKeptPerNodeAndPerWords) {
    tell("A", IncidentKind::OpenFailed, "cannot open port 1: gone");
    tell("B", IncidentKind::OpenFailed, "cannot open port 1: gone");
    tell("A", IncidentKind::Error, "error 8002: gone");
    tell("A", IncidentKind::OpenFailed, "cannot open port 1: gone");
    tell("A", IncidentKind::Error, "error 8002: gone");
    EXPECT_EQ(lines.size(), 3u) << "alternating failures of one node each collapse on their own";
}

TEST_F(TracePrinting, ProtocolIncidentsAreNeverCollapsed) {
    for (const auto kind :
         {IncidentKind::Sent, IncidentKind::Received, IncidentKind::TimedOut, IncidentKind::Retried,
          IncidentKind::BadCheck, IncidentKind::Dropped, IncidentKind::Closed}) {
        lines.clear();
        for (int i = 0; i < 3; ++i) tell("Plc", kind, "same words");
        EXPECT_EQ(lines.size(), 3u) << platform::IncidentKindName(kind);
    }
}

}  // namespace
}  // namespace maroset
