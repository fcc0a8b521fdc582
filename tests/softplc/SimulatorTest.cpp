#include "sim/softplc/SoftPlcSimulator.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "SoftPlcProject.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using std::chrono::milliseconds;

// The driver against the simulator, in memory on the virtual clock: node PLC1 (scan rate
// 1000) at plc:5000 with two tags.
class SoftPlcAgainstSimulator : public test::RuntimeFixture {
  protected:
    SoftPlcAgainstSimulator() {
        runtime().tcp().setRealSockets(false);
        sim = sim::SoftPlcSimulator::InMemory("plc", 5000, {1000, 0});
        db().AddAllNodes(test::SoftPlcProject(driveRoot() / "project.db",
                                              "('PLC1', 'NUVTCPIP', 1000, 'plc', 5000)"));
        plc = db().getNode("PLC1");
        plc->AddTag(41, "Level");
        plc->AddTag(42, "Flow");
    }
    ~SoftPlcAgainstSimulator() override {
        db().RemoveAllNodes();
        plc.reset();
    }
    nodeDB& db() { return *host.host.nodeDB(); }
    platform::TcpClient& socket() {
        return static_cast<ClsDriverNUVSoftPLC&>(*plc->driver()).client()->Winsock;
    }
    // The values the host received for a handle, oldest first.
    std::vector<std::string> valuesOf(int32_t handle) const {
        std::vector<std::string> out;
        for (const auto& c : host.changes)
            for (size_t i = 0; i < c.handles.size(); ++i)
                if (c.handles[i] == handle) out.push_back(c.values[i].string());
        return out;
    }
    size_t received(const std::string& type) const {
        size_t n = 0;
        for (const auto& r : sim->received()) n += r.rfind(type + " ", 0) == 0;
        return n;
    }

    test::HostRecorder host;
    std::unique_ptr<sim::SoftPlcSimulator> sim;
    std::shared_ptr<node> plc;
};

TEST_F(SoftPlcAgainstSimulator, SubscribedValuesArriveAtOnceThenMoveUntilTheSubscriptionEnds) {
    sim->setValue(41, "100");
    db().StartScanning();
    advance(milliseconds(0));
    EXPECT_EQ(valuesOf(41), std::vector<std::string>{"100"});
    EXPECT_EQ(valuesOf(42).size(), 1u);
    advance(milliseconds(3000));
    EXPECT_EQ(valuesOf(41), (std::vector<std::string>{"100", "107", "114", "121"}));
    db().StopScanning();
    advance(milliseconds(3000));
    EXPECT_EQ(valuesOf(41).size(), 4u);
    EXPECT_TRUE(sim->subscribed().empty());
}

TEST_F(SoftPlcAgainstSimulator, WritesReachTheServerAndComeBackAsPushedValues) {
    db().StartScanning();
    advance(milliseconds(0));
    host.changes.clear();
    plc->WriteTag("42", Variant(12.5));
    VbArray<Variant> array(0, std::vector<Variant>{"1", "2", "3"});
    plc->WriteArray("41", array);  // upper bound 2: two elements go
    advance(milliseconds(0));
    EXPECT_EQ(sim->tag(42)->value, "12.5");
    EXPECT_EQ(valuesOf(42), std::vector<std::string>{"12.5"});
    EXPECT_EQ(valuesOf(41), std::vector<std::string>{"1,2"});
}

TEST_F(SoftPlcAgainstSimulator, LostAcksNaksSplitAndCorruptFramesAreAllRecoveredByResends) {
    sim->dropAcks(1);
    db().StartScanning();  // the TSL is taken but its ACK is lost
    advance(milliseconds(1500));
    EXPECT_EQ(received("TSL"), 2u) << "resent after three silent ticks";

    sim->nakNext(1);
    plc->WriteTag("41", Variant("5"));
    advance(milliseconds(0));
    EXPECT_EQ(received("NTV"), 1u) << "NAKed, resent at once, then taken";
    EXPECT_EQ(sim->tag(41)->value, "5");

    host.changes.clear();
    sim->splitNext(1);
    sim->setValue(42, "77");
    advance(milliseconds(0));
    EXPECT_EQ(valuesOf(42), (std::vector<std::string>{"77", "77"}))
        << "each half NAKed, and each NAK resends the frame";

    host.changes.clear();
    sim->corruptNext(1);
    sim->setValue(42, "78");
    advance(milliseconds(0));
    EXPECT_EQ(valuesOf(42), std::vector<std::string>{"78"});
}

TEST_F(SoftPlcAgainstSimulator, ASilentServerCostsTheClientFourTriesAndNothingElse) {
    db().StartScanning();
    advance(milliseconds(0));
    sim->setSilent(true);
    plc->WriteTag("41", Variant("9"));
    advance(milliseconds(7000));
    auto& queue = static_cast<ClsDriverNUVSoftPLC&>(*plc->driver()).client()->TXQueue;
    EXPECT_EQ(queue.Count(), 0) << "given up";
    sim->setSilent(false);
    plc->WriteTag("41", Variant("10"));
    advance(milliseconds(0));
    EXPECT_EQ(sim->tag(41)->value, "10");
}

TEST_F(SoftPlcAgainstSimulator, AfterTheServerClosesOrRestartsTheNextActivationReconnects) {
    db().StartScanning();
    advance(milliseconds(0));
    sim->closeConnections();
    advance(milliseconds(2000));
    EXPECT_EQ(socket().State(), platform::TcpClient::sckClosing);
    db().StartScanning();
    advance(milliseconds(0));
    EXPECT_EQ(sim->clients(), 1u);
    EXPECT_EQ(sim->subscribed(), (std::vector<int32_t>{41, 42}));

    sim->stopListening();
    advance(milliseconds(0));
    db().StartScanning();  // refused: the subscription is lost with it
    advance(milliseconds(0));
    EXPECT_EQ(socket().State(), platform::TcpClient::sckError);
    sim->startListening();
    host.changes.clear();
    db().StartScanning();
    advance(milliseconds(0));
    EXPECT_EQ(sim->subscribed(), (std::vector<int32_t>{41, 42}));
    EXPECT_EQ(valuesOf(41).size(), 1u);
}

TEST_F(SoftPlcAgainstSimulator, AFloodIsDeliveredInFullWithoutHoldingTheLoop) {
    db().StartScanning();
    advance(milliseconds(0));
    host.changes.clear();
    sim->flood(500);
    advance(milliseconds(0));
    EXPECT_EQ(valuesOf(41).size(), 500u);
    EXPECT_EQ(sim->clients(), 1u);
}

TEST_F(SoftPlcAgainstSimulator, TwoNodesHaveASubscriptionEachOnOneServer) {
    db().AddAllNodes(
        test::SoftPlcProject(driveRoot() / "second.db", "('PLC2', 'NUVTCPIP', 500, 'plc', 5000)"));
    db().getNode("PLC2")->AddTag(43, "Speed");
    db().StartScanning();
    advance(milliseconds(0));
    EXPECT_EQ(sim->clients(), 2u);
    EXPECT_EQ(sim->subscribed(), (std::vector<int32_t>{41, 42, 43}));
    EXPECT_EQ(valuesOf(43).size(), 1u);
}

}  // namespace
}  // namespace maroset
