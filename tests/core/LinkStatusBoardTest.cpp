#include "core/LinkStatusBoard.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "core/Runtime.h"
#include "core/node.h"
#include "support/ErrorOf.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using platform::IncidentKind;

class LinkStatusBoardTest : public test::RuntimeFixture {
  protected:
    std::shared_ptr<node> start(const std::string& name, const Variant& driver,
                                const char* server = "") {
        auto n = std::make_shared<node>();
        n->Name = name;
        n->DriverName = driver;
        n->ServerName = Variant(server);
        n->ScanRate = Variant(500);
        n->Init();
        return n;
    }
    void tell(const std::string& node, IncidentKind kind, const std::string& text = "",
              const std::string& endpoint = "") {
        runtime().incidents().report(node, kind, endpoint, [&] {
            ++textsBuilt;
            return text;
        });
    }
    const LinkStatus& status(const std::string& node) {
        const LinkStatus* s = runtime().linkStatus().Find(node);
        EXPECT_NE(s, nullptr) << node;
        static const LinkStatus none;
        return s ? *s : none;
    }
    int textsBuilt = 0;
};

TEST_F(LinkStatusBoardTest, IncidentsMoveTheStateAndTheCounters) {
    // A DF1 node opens its port only when it first polls: nothing but the incidents below
    // moves its link.
    auto plc = start("Plc", Variant("NUVABDF1"));
    std::vector<std::string> changes;
    const auto sub = runtime().linkStatus().StateChanged.subscribe(
        [&](const LinkStatus& s) { changes.push_back(s.node + "=" + std::string(LinkStateName(s.state))); });
    EXPECT_EQ(status("plc").state, LinkState::Connecting);  // any letter case finds it
    EXPECT_EQ(status("Plc").driver, "NUVABDF1");

    tell("Plc", IncidentKind::Opening, "connecting to 127.0.0.1:5000", "127.0.0.1:5000");
    tell("Plc", IncidentKind::Opened, "connected to 127.0.0.1:5000", "127.0.0.1:5000");
    tell("Plc", IncidentKind::Sent, "frame");
    tell("Plc", IncidentKind::Received, "frame");
    tell("Plc", IncidentKind::Received, "frame");
    tell("Plc", IncidentKind::Retried, "NAK");
    tell("Plc", IncidentKind::BadCheck, "bad CRC");
    advance(std::chrono::seconds(2));
    tell("Plc", IncidentKind::TimedOut, "no reply");
    tell("Plc", IncidentKind::Closed, "peer closed");  // already down: no second change
    tell("Plc", IncidentKind::Received, "frame");       // back: one reconnect

    const LinkStatus& s = status("Plc");
    EXPECT_EQ(s.state, LinkState::Up);
    EXPECT_EQ(s.endpoint, "127.0.0.1:5000");
    EXPECT_EQ(s.counters.requests, 1u);
    EXPECT_EQ(s.counters.replies, 3u);
    EXPECT_EQ(s.counters.retries, 1u);
    EXPECT_EQ(s.counters.badChecks, 1u);
    EXPECT_EQ(s.counters.timeouts, 1u);
    EXPECT_EQ(s.counters.reconnects, 1u);
    ASSERT_TRUE(s.last);
    EXPECT_EQ(s.last->text, "peer closed");  // routine frames are counted, not remembered
    EXPECT_EQ(changes, (std::vector<std::string>{"Plc=up", "Plc=down", "Plc=up"}));
    // Words are built for what is remembered only, never for routine frames.
    EXPECT_EQ(textsBuilt, 6);
}

TEST_F(LinkStatusBoardTest, LocalNodesStayLocalAndCountTheirReports) {
    auto mem = start("Mem", Variant("MEMTAG"));
    mem->AddTag(1, "A");
    mem->WriteTag("1", Variant(5));
    mem->WriteTag("1", Variant(6));
    tell("Mem", IncidentKind::TimedOut, "cannot happen, but must not move a local node");
    EXPECT_EQ(status("Mem").state, LinkState::Local);
    EXPECT_EQ(status("Mem").counters.values, 2u);
    // Incidents of nodes nobody started are ignored.
    tell("Ghost", IncidentKind::Opened, "x");
    EXPECT_EQ(runtime().linkStatus().Find("Ghost"), nullptr);
}

TEST_F(LinkStatusBoardTest, ADriverThatDidNotStartIsDownWithItsError) {
    // The OPC driver traps its connect failure itself: the node starts, its link is down.
    auto opc = start("Opc", Variant("OPC"), "No.Such.Server");
    const LinkStatus& s = status("Opc");
    EXPECT_EQ(s.state, LinkState::Down);
    ASSERT_TRUE(s.last);
    EXPECT_EQ(s.last->text.rfind("did not start: error ", 0), 0u) << s.last->text;

    // An error that reaches the host leaves the node's entry down as well.
    std::shared_ptr<node> bad = std::make_shared<node>();
    bad->Name = "Bad";
    bad->DriverName = Variant::Null();
    EXPECT_EQ(test::errorOf([&] { bad->Init(); }), err::InvalidUseOfNull);
    EXPECT_EQ(status("Bad").state, LinkState::Down);

    // A memory node that starts cleanly is local, with nothing to tell.
    auto mem = start("Mem", Variant("memtag"));
    EXPECT_EQ(status("Mem").state, LinkState::Local);
    EXPECT_FALSE(status("Mem").last);
}

TEST_F(LinkStatusBoardTest, ANodeLeavesWhenDestroyedButNotAfterANewerOneTookItsName) {
    auto first = start("N", Variant("NUVTCPIP"));
    auto second = start("N", Variant("NUVABDF1"));
    first.reset();  // the older object goes: the newer entry stays
    EXPECT_EQ(status("N").driver, "NUVABDF1");
    second.reset();
    EXPECT_EQ(runtime().linkStatus().Find("N"), nullptr);
    EXPECT_TRUE(runtime().linkStatus().All().empty());
}

}  // namespace
}  // namespace maroset
