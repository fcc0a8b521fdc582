#include "drivers/softplc/ClsDriverNUVSoftPLC.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "SoftPlcProject.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "sim/softplc/ServerFrames.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using sim::ServerFrame;
using std::chrono::milliseconds;
using test::errorOf;

// A project with one node of type NUVTCPIP at plc:5000, loaded through the façade; the test
// plays the server in memory and reads the client's frames with the server side's reader.
class SoftPlcDriver : public test::RuntimeFixture {
  protected:
    SoftPlcDriver() {
        runtime().tcp().setRealSockets(false);
        plug();
        db().AddAllNodes(test::SoftPlcProject(driveRoot() / "project.db",
                                              "('PLC1', 'nuvtcpip', 1000, 'plc', 5000)"));
        plc = db().getNode("PLC1");
    }

    // The nodes shut down with the runtime, after this fixture's members are gone.

    void plug(milliseconds connectDelay = milliseconds(0)) {
        runtime().tcp().plug(
            "plc", 5000,
            [this](const std::shared_ptr<platform::MemoryTcpLink>& l) {
                link = l;
                ++connections;
                l->serverEnd()->listen({{}, {}, [](std::string_view) {}, {}, {}});
            },
            connectDelay);
    }
    nodeDB& db() { return *host.host.nodeDB(); }
    ClsDriverNUVSoftPLC& driver() { return static_cast<ClsDriverNUVSoftPLC&>(*plc->driver()); }
    void fromServer(const std::string& bytes) {
        link->serverEnd()->write(bytes);
        advance(milliseconds(0));
    }
    // The data frames the client sent since the last look, as "TYPE data"; ACKs and NAKs are
    // left out.
    std::vector<std::string> frames() {
        std::vector<std::string> out;
        if (!link) return out;
        reader.feed(link->takeClientSent());
        for (std::string unit; reader.next(unit);) {
            const auto f = ServerFrame::Read(unit);
            if (!f) {
                out.push_back("bad frame " + unit);
            } else if (f->type != "ACK" && f->type != "NAK") {
                out.push_back(f->type + " " + f->data);
            }
        }
        return out;
    }
    using Frames = std::vector<std::string>;

    test::HostRecorder host;
    std::shared_ptr<node> plc;
    std::shared_ptr<platform::MemoryTcpLink> link;
    int connections = 0;
    sim::ServerFrameReader reader;
    test::IncidentRecorder incidents_;
    std::vector<std::string>& trace = incidents_.lines;
};

TEST_F(SoftPlcDriver, ConnectsAtLoadAndSubscribesEveryTagOnActivation) {
    EXPECT_STREQ(plc->driver()->className(), "ClsDriverNUVSoftPLC");
    ASSERT_EQ(connections, 1) << "startup connects";
    EXPECT_EQ(driver().client()->Winsock.State(), platform::TcpClient::sckConnected);
    plc->AddTag(5, "Tank1");
    plc->AddTag(6, "Tank2");
    EXPECT_EQ(link->clientSent(), "") << "tags are only recorded before activation";
    db().StartScanning();
    EXPECT_EQ(link->clientSent(), ServerFrame::Write("TSL", 1, "1000;~2;~5;~Tank1;~6;~Tank2"));
    reader = {};
    link->takeClientSent();

    // While active every change of the tag list resends the whole list.
    plc->AddTag(7, "Pump");
    plc->RemoveTag(99);  // not subscribed: the list stays as it is, and is still resent
    plc->RemoveTag(5);
    db().StopScanning();
    plc->AddTag(8, "Valve");
    EXPECT_EQ(frames(), (Frames{"TSL 1000;~3;~5;~Tank1;~6;~Tank2;~7;~Pump",
                                "TSL 1000;~3;~5;~Tank1;~6;~Tank2;~7;~Pump",
                                "TSL 1000;~2;~6;~Tank2;~7;~Pump", "RSL  "}));
}

TEST_F(SoftPlcDriver, KeepsDuplicateTagsAndRemovesEveryOneOfAHandle) {
    db().StartScanning();
    plc->AddTag(5, "A");
    plc->AddTag(5, "A");
    plc->RemoveTag(5);
    EXPECT_EQ(frames(), (Frames{"TSL 1000;~0", "TSL 1000;~1;~5;~A", "TSL 1000;~2;~5;~A;~5;~A",
                                "TSL 1000;~0"}));
}

TEST_F(SoftPlcDriver, WritesOneValueAsNtvAndAnArrayAsAtvWithTheUpperBoundAsItsCount) {
    plc->WriteTag("5", Variant(int32_t{42}));
    plc->WriteTag("5", Variant("on"));
    plc->WriteTag("5", Variant(true));
    plc->WriteTag("5", Variant::Null());
    VbArray<Variant> values(0, std::vector<Variant>{"a", "b", Variant(2.5), "d"});
    plc->WriteArray("7", values);
    EXPECT_EQ(frames(), (Frames{"NTV 1;~5;~42", "NTV 1;~5;~on", "NTV 1;~5;~True", "NTV 1;~5;~",
                                "ATV 3;~7;~a;~b;~2.5"}));
    VbArray<Variant> oneBased(1, std::vector<Variant>{"x"});
    EXPECT_EQ(errorOf([&] { plc->WriteArray("7", oneBased); }), 9) << "element 0 is read";
    EXPECT_EQ(driver().WriteItem(5, Variant(int32_t{1})), 0);
}

TEST_F(SoftPlcDriver, ReportsPushedValuesAsTextWithOneBasedArrays) {
    plc->AddTag(5, "Tank1");
    db().StartScanning();
    fromServer(ServerFrame::Write("NTV", 1, "2;~5;~10.5;~6;~hello"));
    ASSERT_EQ(host.changes.size(), 1u);
    const auto& c = host.changes[0];
    EXPECT_EQ(c.count, 2);
    EXPECT_EQ(c.handlesLower, 1);
    EXPECT_EQ(c.valuesLower, 1);
    EXPECT_EQ(c.handles, (std::vector<int32_t>{5, 6}));
    EXPECT_EQ(c.values, (std::vector<Variant>{Variant("10.5"), Variant("hello")}));
    // A count of 0, and the types the driver ignores, deliver nothing.
    fromServer(ServerFrame::Write("NTV", 2, "0") + ServerFrame::Write("SSD", 3, "x") +
               ServerFrame::Write("ERR", 4, "bad") + ServerFrame::Write("MSG", 5, "hi"));
    EXPECT_EQ(host.changes.size(), 1u);
    EXPECT_TRUE(host.errors.empty()) << "the driver reports nothing upward";
}

TEST_F(SoftPlcDriver, AMalformedNtvIsAcknowledgedButDeliversNothing) {
    for (const char* bad : {"1;~x;~5", "3;~5;~a;~6", "2000000000;~5;~a;~6", ";~"}) {
        fromServer(ServerFrame::Write("NTV", 9, bad));
        EXPECT_NE(link->takeClientSent().find("<%ACK"), std::string::npos) << bad;
    }
    EXPECT_TRUE(host.changes.empty());
    auto count = [&](const std::string& line) {
        return std::count(trace.begin(), trace.end(), line);
    };
    EXPECT_EQ(count("PLC1: error 9 in Maroset.FrmCommClient: Subscript out of range"), 2);
    EXPECT_EQ(count("PLC1: error 13 in Maroset.FrmCommClient: Type mismatch"), 2);
    // The next good frame goes through, an empty value included.
    fromServer(ServerFrame::Write("NTV", 10, "1;~5"));
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].values, std::vector<Variant>{Variant("")});
}

TEST_F(SoftPlcDriver, WithTrappingOnErrorsAreLoggedUnderTheBorrowedLabels) {
    runtime().trap().setEnabled(true);
    fromServer(ServerFrame::Write("NTV", 9, "1;~x;~5"));
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_NE(log.find("Module\\Sub: FrmCommClient.Winsock_DataArrival 0"), std::string::npos);
    EXPECT_EQ(errorLogRecords(), 6u) << "retried until the burst passes five, then skipped";

    VbArray<Variant> oneBased(1, std::vector<Variant>{"x"});
    plc->WriteArray("7", oneBased);
    EXPECT_NE(readDriveFile("MarosetErrors.txt")
                  .find("Module\\Sub: ClsDriverOPC.ClsDriverOPC.WriteItem 0"),
              std::string::npos);
}

TEST_F(SoftPlcDriver, AddItemsTakesHandlesAsSixteenBitsAndAddsNothingWhenOneOverflows) {
    VbArray<std::string> names(1, std::vector<std::string>{"A", "B"});
    VbArray<int32_t> handles(1, std::vector<int32_t>{3, 40000});
    EXPECT_EQ(errorOf([&] { driver().AddItems(2, names, handles); }), 6);
    handles(2) = -4;
    EXPECT_TRUE(driver().AddItems(2, names, handles));
    EXPECT_EQ(driver().SubscriptionList(), "1000;~2;~3;~A;~-4;~B");
    EXPECT_EQ(errorOf([&] { plc->AddTag(32768, "C"); }), 6) << "the node converts first";
}

TEST_F(SoftPlcDriver, ActivationReconnectsADroppedConnectionAndSubscribesAgain) {
    plc->AddTag(5, "Tank1");
    link->serverEnd()->close();
    advance(milliseconds(0));
    EXPECT_EQ(driver().client()->Winsock.State(), platform::TcpClient::sckClosing);
    db().StartScanning();
    EXPECT_EQ(connections, 2);
    EXPECT_EQ(frames(), Frames{"TSL 1000;~1;~5;~Tank1"});
}

TEST_F(SoftPlcDriver, ASubscriptionSentBeforeTheReconnectIsUpIsLostUntilTheNextTagChange) {
    link->reset();
    advance(milliseconds(0));
    plug(milliseconds(200));
    db().StartScanning();
    EXPECT_EQ(trace.back(),
              "PLC1: No Server Connection Available: not connected to plc:5000, lost TSL frame "
              "001: 1000;~0");
    advance(milliseconds(200));
    EXPECT_EQ(connections, 2);
    EXPECT_EQ(frames(), Frames{});
    plc->AddTag(5, "Tank1");
    EXPECT_EQ(frames(), Frames{"TSL 1000;~1;~5;~Tank1"});
}

TEST_F(SoftPlcDriver, RemovingTheNodesUnsubscribesAndClosesTheConnection) {
    db().StartScanning();
    frames();
    bool closed = false;
    link->serverEnd()->listen({{}, {}, [](std::string_view) {}, [&] { closed = true; }, {}});
    db().RemoveAllNodes();
    plc.reset();
    advance(milliseconds(0));
    EXPECT_EQ(frames(), (Frames{"RSL  ", "RSL  "})) << "StopScanning's, then shutdown's";
    EXPECT_TRUE(closed);
}

TEST_F(SoftPlcDriver, AHostThatDropsEverythingInsideAValueChangeStopsTheRestOfTheArrival) {
    auto drop = host.host.ValueChange.subscribe([&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) {
        db().RemoveAllNodes();
        plc.reset();
    });
    fromServer(ServerFrame::Write("NTV", 1, "1;~5;~a") + ServerFrame::Write("NTV", 2, "1;~5;~b"));
    EXPECT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(db().count(), 0);
    advance(milliseconds(10000));
}

}  // namespace
}  // namespace maroset
