#include "core/LinkStatusBoard.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/nodeDB.h"
#include "df1/Df1Line.h"
#include "gateway/EventStream.h"
#include "sim/df1/Df1Simulator.h"
#include "sim/intech/IntechSimulator.h"
#include "sim/softplc/SoftPlcSimulator.h"
#include "softplc/SoftPlcProject.h"

namespace maroset::test {
namespace {

// What the service sees of a node's link while its device goes away and comes back: the
// board's state and counters, and the event stream's `link` events.
class LinkWatch {
  public:
    explicit LinkWatch(Runtime& rt)
        : rt_(rt),
          stream_(rt.loop(), rt.reports(), rt.linkStatus(), rt.clock()),
          client_(stream_.connect()) {}

    const LinkStatus& status(const std::string& node) const {
        const LinkStatus* s = rt_.linkStatus().Find(node);
        EXPECT_NE(s, nullptr) << node;
        static const LinkStatus none;
        return s ? *s : none;
    }
    std::string state(const std::string& node) const {
        return std::string(LinkStateName(status(node).state));
    }
    // The `link` events sent so far, as "NODE STATE".
    std::vector<std::string> linkEvents() {
        char buffer[4096];
        while (const size_t n = client_->read(buffer, sizeof buffer)) text_.append(buffer, n);
        std::vector<std::string> events;
        const std::string prefix = "event: link\ndata: {\"node\":\"";
        for (size_t at = text_.find(prefix); at != std::string::npos;
             at = text_.find(prefix, at + 1)) {
            const size_t name = at + prefix.size();
            const size_t nameEnd = text_.find('"', name);
            const size_t state = text_.find("\"state\":\"", nameEnd) + 9;
            events.push_back(text_.substr(name, nameEnd - name) + " " +
                             text_.substr(state, text_.find('"', state) - state));
        }
        return events;
    }

  private:
    Runtime& rt_;
    gateway::EventStream stream_;
    std::shared_ptr<gateway::EventStream::Client> client_;
    std::string text_;
};

// A DF1 PLC on an in-memory line goes silent and answers again.
class Df1LinkState : public Df1LineFixture {
  protected:
    Df1LinkState() {
        db->AddNode("PLC", "NUVABDF1", "", 500);
        db->getNode("PLC")->AddTag(1, "N7:0");
        db->StartScanning();
    }
    ~Df1LinkState() override {
        db->StopScanning();
        db->RemoveAllNodes();
    }

    ClsNodeDBInterface host;
    std::shared_ptr<nodeDB> db = host.nodeDB();
    sim::Df1Simulator plc{loop(), cable.deviceEnd()};
    LinkWatch watch{runtime()};
};

TEST_F(Df1LinkState, AQuietPlcTakesTheNodeDownAndItsAnswerBringsItBackUp) {
    advance(2s);
    EXPECT_EQ(watch.state("PLC"), "up");
    const LinkCounters before = watch.status("PLC").counters;
    EXPECT_GT(before.requests, 0u);
    EXPECT_GT(before.replies, 0u);

    plc.silence(-1);
    advance(15s);
    EXPECT_EQ(watch.state("PLC"), "down");
    EXPECT_GT(watch.status("PLC").counters.timeouts, before.timeouts);
    ASSERT_TRUE(watch.status("PLC").last);

    plc.silence(0);
    advance(15s);
    EXPECT_EQ(watch.state("PLC"), "up");
    EXPECT_EQ(watch.status("PLC").counters.reconnects, before.reconnects + 1);
    EXPECT_GT(watch.status("PLC").counters.replies, before.replies);
    const auto events = watch.linkEvents();
    ASSERT_GE(events.size(), 2u);
    EXPECT_EQ(events[events.size() - 2], "PLC down");
    EXPECT_EQ(events.back(), "PLC up");
}

// Intech instruments on an in-memory line stop answering and answer again.
class IntechLinkState : public RuntimeFixture {
  protected:
    IntechLinkState() {
        runtime().serialDevices().plug("/dev/ttyS0", cable.hostEnd());
        db->AddNode("Meter", "NUVINTECH", "", 100);
        db->getNode("Meter")->AddTag(1, "01LAI4");
        db->StartScanning();
    }
    ~IntechLinkState() override {
        db->StopScanning();
        db->RemoveAllNodes();
    }

    ClsNodeDBInterface host;
    std::shared_ptr<nodeDB> db = host.nodeDB();
    platform::MemorySerialCable cable{loop()};
    sim::IntechSimulator instruments{loop(), cable.deviceEnd(), "memory cable", {"01"}};
    LinkWatch watch{runtime()};
};

TEST_F(IntechLinkState, SilentInstrumentsTakeTheNodeDownAndTheirAnswerBringsItBackUp) {
    advance(3s);
    EXPECT_EQ(watch.state("Meter"), "up");
    const LinkCounters before = watch.status("Meter").counters;

    instruments.setFault(sim::IntechSimulator::Fault::Silence, sim::IntechSimulator::Always);
    advance(15s);
    EXPECT_EQ(watch.state("Meter"), "down");
    EXPECT_GT(watch.status("Meter").counters.timeouts, before.timeouts);

    instruments.setFault(sim::IntechSimulator::Fault::None);
    advance(15s);
    EXPECT_EQ(watch.state("Meter"), "up");
    EXPECT_EQ(watch.status("Meter").counters.reconnects, before.reconnects + 1);
    const auto events = watch.linkEvents();
    ASSERT_GE(events.size(), 2u);
    EXPECT_EQ(events[events.size() - 2], "Meter down");
    EXPECT_EQ(events.back(), "Meter up");
}

// A soft-PLC server in memory stops listening, drops its clients and starts again.
class SoftPlcLinkState : public RuntimeFixture {
  protected:
    SoftPlcLinkState() {
        runtime().tcp().setRealSockets(false);
        server = sim::SoftPlcSimulator::InMemory("plc", 5000);
        db->AddAllNodes(
            SoftPlcProject(driveRoot() / "project.db", "('PLC1', 'nuvtcpip', 1000, 'plc', 5000)"));
        db->getNode("PLC1")->AddTag(41, "Level");
        db->StartScanning();
    }
    ~SoftPlcLinkState() override {
        db->StopScanning();
        db->RemoveAllNodes();
    }

    ClsNodeDBInterface host;
    std::shared_ptr<nodeDB> db = host.nodeDB();
    std::unique_ptr<sim::SoftPlcSimulator> server;
    LinkWatch watch{runtime()};
};

TEST_F(SoftPlcLinkState, AServerThatGoesAwayTakesTheNodeDownAndItsReturnBringsItBackUp) {
    advance(3s);
    EXPECT_EQ(watch.state("PLC1"), "up");
    const LinkCounters before = watch.status("PLC1").counters;

    server->stopListening();
    server->closeConnections();
    advance(2s);
    EXPECT_EQ(watch.state("PLC1"), "down");

    server->startListening();
    advance(30s);
    EXPECT_EQ(watch.state("PLC1"), "up");
    EXPECT_EQ(watch.status("PLC1").counters.reconnects, before.reconnects + 1);
    EXPECT_GT(watch.status("PLC1").counters.requests, before.requests);
    const auto events = watch.linkEvents();
    ASSERT_GE(events.size(), 2u);
    EXPECT_EQ(events[events.size() - 2], "PLC1 down");
    EXPECT_EQ(events.back(), "PLC1 up");
}

}  // namespace
}  // namespace maroset::test
