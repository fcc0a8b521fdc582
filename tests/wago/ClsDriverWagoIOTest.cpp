#include "drivers/wago/ClsDriverWagoIO.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "core/node.h"
#include "lang/Conversions.h"
#include "sim/wago/WagoCouplerSimulator.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset::test {
namespace {

using std::chrono::milliseconds;
using Coupler = sim::WagoCouplerSimulator;
using Request = Coupler::Request;

constexpr uint8_t kFc01 = 0x01, kFc02 = 0x02, kFc03 = 0x03, kFc04 = 0x04, kFc07 = 0x07,
                  kFc15 = 0x0F, kFc16 = 0x10;
constexpr Request kLinkTest{kFc07, 0, 0};

// The driver on the virtual clock against the coupler simulator on loopback (on its own
// thread: the driver's calls block). The runtime's Modbus port is the simulator's.
class WagoDriver : public RuntimeFixture {
  protected:
    WagoDriver() { runtime().setModbusPort(coupler.port()); }

    // A WAGOIO node as the node collection makes one, scanning every 100 ms.
    std::shared_ptr<node> makeNode(Variant ip = Variant("127.0.0.1"), Variant port = Variant()) {
        auto n = std::make_shared<node>();
        n->Name = "Coupler";
        n->DriverName = Variant("WAGOIO");
        n->IPAddress = std::move(ip);
        n->Port = std::move(port);
        n->ScanRate = Variant(int32_t{100});
        n->Init();
        return n;
    }
    static ClsDriverWagoIO& driverOf(const node& n) {
        return dynamic_cast<ClsDriverWagoIO&>(*n.driver());
    }
    // Adds tags with handles 1, 2, ... and switches scanning on.
    void scan(const std::vector<std::string>& addresses) {
        for (size_t i = 0; i < addresses.size(); ++i)
            n->AddTag(static_cast<int32_t>(i + 1), addresses[i]);
        n->IsActive(true);
        coupler.clearRequests();
    }
    void tick() { advance(milliseconds(100)); }
    std::vector<Variant> lastValues() const { return host.changes.back().values; }

    Coupler coupler{{.port = 0, .motion = false}};
    HostRecorder host;
    std::shared_ptr<node> n;
};

// --- addresses and reports ------------------------------------------------------------------

using WagoScan = WagoDriver;

TEST_F(WagoScan, ReadsEveryTagKindAtItsAddressInOnePass) {
    coupler.setInputWord(3, 0x1234);
    coupler.setInputWord(4, -2);
    coupler.setOutputWord(5, 77);
    coupler.setInputBit(35, true);
    coupler.setOutputBit(7, true);
    coupler.setOutputBit(4094, true);
    coupler.setOutputBit(4095, true);
    n = makeNode();
    scan({"IW3", "iw4", "OW5", "ID2.3", "OD7", "OD4094", "OD4095", "od0.15"});
    tick();

    EXPECT_EQ(coupler.requests(), (std::vector<Request>{{kFc04, 3, 1},
                                                        {kFc04, 4, 1},
                                                        {kFc03, 517, 1},
                                                        {kFc02, 35, 1},
                                                        {kFc01, 519, 1},
                                                        {kFc01, 4606, 1},
                                                        {kFc01, 8191, 1},
                                                        {kFc01, 527, 1}}));
    ASSERT_EQ(host.changes.size(), 1u);
    const auto& c = host.changes[0];
    EXPECT_EQ(c.count, 8);
    EXPECT_EQ(c.handlesLower, 1);
    EXPECT_EQ(c.valuesLower, 1);
    EXPECT_EQ(c.handles, (std::vector<int32_t>{1, 2, 3, 4, 5, 6, 7, 8}));
    // 16-bit integers: registers signed, bits 0 or 1.
    EXPECT_EQ(c.values, (std::vector<Variant>{int16_t{4660}, int16_t{-2}, int16_t{77}, int16_t{1},
                                              int16_t{1}, int16_t{1}, int16_t{1}, int16_t{0}}));
}

TEST_F(WagoScan, ReportsEveryTagOnTheFirstPassThenOnlyChanges) {
    coupler.setInputWord(0, 10);
    n = makeNode();
    scan({"IW0", "IW1", "ID0"});
    tick();
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].count, 3);  // zeros too: nothing was reported before

    tick();
    EXPECT_EQ(host.changes.size(), 1u);

    coupler.setInputWord(1, -7);
    tick();
    ASSERT_EQ(host.changes.size(), 2u);
    EXPECT_EQ(host.changes[1].handles, std::vector<int32_t>{2});
    EXPECT_EQ(lastValues(), std::vector<Variant>{int16_t{-7}});

    coupler.setInputWord(0, 11);
    coupler.setInputBit(0, true);
    tick();
    ASSERT_EQ(host.changes.size(), 3u);
    EXPECT_EQ(host.changes[2].handles, (std::vector<int32_t>{1, 3}));
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{11}, int16_t{1}}));

    n->IsActive(false);
    coupler.clearRequests();
    tick();
    EXPECT_TRUE(coupler.requests().empty());
}

TEST_F(WagoScan, StoresBitTagsInWordDotBitAsPlainBitNumbers) {
    n = makeNode();
    for (const char* address : {"ID2.3", "OD0.15", "od1.0", "ID7", "IW2.3"}) n->AddTag(1, address);
    const auto& names = driverOf(*n).TagNames();
    EXPECT_EQ(std::vector<Variant>(names.begin(), names.end()),
              (std::vector<Variant>{"ID35", "OD15", "od16", "ID7", "IW2.3"}));
    // Parts that are no numbers, and a bit number past 16 bits, fail the call.
    EXPECT_EQ(errorOf([&] { n->AddTag(2, "ID2.x"); }), 13);
    EXPECT_EQ(errorOf([&] { n->AddTag(2, "ID2048.0"); }), 6);
    EXPECT_EQ(driverOf(*n).TagCount(), 5);
}

TEST_F(WagoScan, SkipsShortTagsAndReadsNothingForOtherPrefixes) {
    coupler.setInputWord(6, 66);
    n = makeNode();
    scan({"I", "XW5", "IW6"});
    tick();
    EXPECT_EQ(coupler.requests(), (std::vector<Request>{{kFc04, 6, 1}}));
    // The unread tag keeps the 0 it starts with, reported once like any first value.
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, (std::vector<int32_t>{2, 3}));
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{0}, int16_t{66}}));
}

// --- writes -----------------------------------------------------------------------------------

using WagoWrites = WagoDriver;

TEST_F(WagoWrites, OutputsAreWrittenToPlainAddressesAndReadBackAtTheOffsets) {
    n = makeNode();
    scan({"OW5", "OD0.3", "OD4095"});
    n->WriteTag("1", Variant(int32_t{1234}));
    n->WriteTag("2", Variant(int16_t{2}));  // any value but 0 sets the bit
    n->WriteTag("3", Variant(true));
    EXPECT_EQ(coupler.requests(),
              (std::vector<Request>{{kFc16, 5, 1}, {kFc15, 3, 1}, {kFc15, 4095, 1}}));
    EXPECT_EQ(coupler.outputWord(5), 1234);
    EXPECT_TRUE(coupler.outputBit(3));
    EXPECT_TRUE(coupler.outputBit(4095));
    EXPECT_TRUE(host.changes.empty());  // the value comes back through the scan

    tick();
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{1234}, int16_t{1}, int16_t{1}}));

    n->WriteTag("1", Variant(int32_t{-5}));
    n->WriteTag("2", Variant(int32_t{0}));
    EXPECT_EQ(coupler.outputWord(5), -5);
    EXPECT_FALSE(coupler.outputBit(3));
    tick();
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{-5}, int16_t{0}}));
}

TEST_F(WagoWrites, InputsAreNotWrittenAndBadWritesFailBeforeTheWire) {
    n = makeNode();
    scan({"IW0", "ID0", "OW1"});
    n->WriteTag("1", Variant(int32_t{9}));
    n->WriteTag("2", Variant(int32_t{1}));
    EXPECT_EQ(errorOf([&] { n->WriteTag("99", Variant(int32_t{1})); }), 9);
    EXPECT_EQ(errorOf([&] { n->WriteTag("3", Variant(int32_t{40000})); }), 6);
    EXPECT_EQ(errorOf([&] { n->WriteTag("3", Variant("much")); }), 13);
    EXPECT_TRUE(coupler.requests().empty());
    EXPECT_TRUE(driverOf(*n).Connected());
}

TEST_F(WagoWrites, AWriteThatFindsTheCouplerGoneReconnectsAndWritesNothing) {
    n = makeNode();
    scan({"OW0"});
    coupler.stop();
    tick();  // the read fails, the reconnect is refused
    EXPECT_FALSE(driverOf(*n).Connected());
    coupler.start();
    coupler.clearRequests();

    n->WriteTag("1", Variant(int32_t{5}));
    EXPECT_EQ(coupler.requests(), std::vector<Request>{kLinkTest});
    EXPECT_EQ(coupler.outputWord(0), 0);
    EXPECT_TRUE(driverOf(*n).Connected());
    n->WriteTag("1", Variant(int32_t{5}));
    EXPECT_EQ(coupler.outputWord(0), 5);
}

// --- connection and recovery --------------------------------------------------------------

using WagoLink = WagoDriver;

TEST_F(WagoLink, ConnectsToPort502AndTestsTheLinkFirst) {
    n = makeNode(Variant("127.0.0.1"), Variant(int32_t{1234}));
    ClsDriverWagoIO& driver = driverOf(*n);
    EXPECT_TRUE(driver.Connected());
    EXPECT_EQ(CLng(driver.Port()), 502);
    EXPECT_EQ(coupler.requests(), std::vector<Request>{kLinkTest});
    EXPECT_EQ(coupler.connectionsAccepted(), 1u);

    // No IPv4 address: nothing is tried. Null is no text at all.
    const auto other = makeNode(Variant("coupler.local"));
    EXPECT_FALSE(driverOf(*other).Connected());
    EXPECT_EQ(coupler.connectionsAccepted(), 1u);
    EXPECT_EQ(errorOf([&] { makeNode(Variant::Null()); }), 94);
}

TEST_F(WagoLink, APassEndsAtTheFirstFailedReadAndReconnects) {
    coupler.setInputWord(0, 1);
    coupler.setInputWord(1, 2);
    n = makeNode();
    // Input word 300 is outside the coupler's image: Illegal data address.
    scan({"IW0", "IW300", "IW1"});
    tick();
    EXPECT_EQ(coupler.requests(),
              (std::vector<Request>{{kFc04, 0, 1}, {kFc04, 300, 1}, kLinkTest}));
    EXPECT_EQ(CLng(driverOf(*n).Status()), 0);  // the link test after the reconnect
    EXPECT_TRUE(driverOf(*n).Connected());
    // What was read before the failure still goes up.
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(host.changes[0].handles, std::vector<int32_t>{1});
    EXPECT_TRUE(driverOf(*n).LastValues()(2).isEmpty());
    EXPECT_EQ(coupler.connectionsAccepted(), 2u);
}

TEST_F(WagoLink, EveryLinkFaultEndsInAReconnectAndScanningResumes) {
    struct Fault {
        const char* name;
        std::function<void(Coupler&, bool)> set;
    };
    const std::vector<Fault> faults = {
        {"silence", [](Coupler& c, bool on) { c.setSilent(on); }},
        {"garbled replies", [](Coupler& c, bool on) { c.setGarbled(on); }},
        {"late replies", [](Coupler& c, bool on) { c.setReplyDelay(milliseconds(on ? 250 : 0)); }},
        {"dropped connections",
         [](Coupler& c, bool on) {
             if (on) c.dropConnections();
         }},
        {"refused connections",
         [](Coupler& c, bool on) {
             c.setRefusing(on);
             if (on) c.dropConnections();
         }},
        {"a restart",
         [](Coupler& c, bool on) {
             if (on)
                 c.stop();
             else
                 c.start();
         }},
    };
    n = makeNode();
    scan({"IW0", "IW1"});
    tick();
    int16_t value = 0;
    for (const auto& fault : faults) {
        SCOPED_TRACE(fault.name);
        fault.set(coupler, true);
        tick();
        tick();
        fault.set(coupler, false);
        // A late answer still being served must not meet the next connect.
        std::this_thread::sleep_for(milliseconds(300));
        coupler.setInputWord(0, ++value);
        const size_t before = host.changes.size();
        for (int i = 0; i < 3 && host.changes.size() == before; ++i) tick();
        // Only what changed: the last values outlive the connection.
        ASSERT_EQ(host.changes.size(), before + 1);
        EXPECT_EQ(host.changes.back().handles, std::vector<int32_t>{1});
        EXPECT_EQ(lastValues(), std::vector<Variant>{value});
        // Failed links leave no socket behind.
        EXPECT_EQ(driverOf(*n).Mbt().OpenConnections(), 1u);
    }
    EXPECT_TRUE(host.errors.empty());
}

TEST_F(WagoLink, ALinkTestThatFailsLeavesTheDriverDisconnectedWithoutLeakingSockets) {
    coupler.setSilent(true);
    n = makeNode();
    EXPECT_FALSE(driverOf(*n).Connected());
    EXPECT_EQ(CLng(driverOf(*n).Status()), platform::mbt::Timeout);
    scan({"IW0"});
    tick();
    tick();
    EXPECT_FALSE(driverOf(*n).Connected());
    EXPECT_LE(driverOf(*n).Mbt().OpenConnections(), 1u);
    // Only link tests: a pass that finds the driver not connected reads nothing.
    for (const auto& r : coupler.requests()) EXPECT_EQ(r, kLinkTest);

    coupler.setSilent(false);
    tick();
    tick();
    EXPECT_TRUE(driverOf(*n).Connected());
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_LE(coupler.openConnections(), 1u);
}

// --- the driver yields: re-entrance and lifetime ------------------------------------------

using WagoYields = WagoDriver;

TEST_F(WagoYields, AWriteMadeWhileThePassYieldsGoesOutAndIsReadInThatPass) {
    n = makeNode();
    scan({"OW0", "OW1"});
    // Due with the scan tick, scheduled after it: runs in the pass's first yield.
    loop().schedule(milliseconds(100), [&] { n->WriteTag("2", Variant(int32_t{9})); });
    tick();
    EXPECT_EQ(coupler.requests(),
              (std::vector<Request>{{kFc16, 1, 1}, {kFc03, 512, 1}, {kFc03, 513, 1}}));
    ASSERT_EQ(host.changes.size(), 1u);
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{0}, int16_t{9}}));
}

TEST_F(WagoYields, TheNodeMayGoWhileThePassYieldsOrInsideItsReport) {
    n = makeNode();
    scan({"IW0", "IW1"});
    loop().schedule(milliseconds(100), [&] { n.reset(); });
    tick();
    EXPECT_TRUE(host.changes.empty());
    EXPECT_TRUE(coupler.requests().empty());

    n = makeNode();
    scan({"IW0", "IW1"});
    auto drop = host.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { n.reset(); });
    tick();
    EXPECT_EQ(host.changes.size(), 1u);
    EXPECT_FALSE(n);
    tick();
}

TEST_F(WagoYields, AShutdownWhileThePassYieldsEndsThePassAndLeavesNoConnection) {
    n = makeNode();
    scan({"IW0", "IW1"});
    loop().schedule(milliseconds(100), [&] { n->driver()->shutdown(); });
    tick();
    EXPECT_TRUE(coupler.requests().empty());
    EXPECT_EQ(driverOf(*n).ScanOwner(), nullptr);
    EXPECT_EQ(driverOf(*n).Mbt().OpenConnections(), 0u);
    EXPECT_EQ(errorOf([&] { n->IsActive(true); }), 91);
}

// --- what the host does not see: trace and error trap ------------------------------------

using WagoDiagnostics = WagoDriver;

TEST_F(WagoDiagnostics, TheTraceTellsEachFailedCallAndEveryReconnect) {
    test::IncidentRecorder incidents;
    const std::vector<std::string>& lines = incidents.lines;
    n = makeNode();
    scan({"IW300"});
    tick();
    coupler.stop();
    n->WriteTag("1", Variant(int32_t{1}));  // an input: nothing written
    tick();
    tick();

    using ::testing::Contains;
    const std::string port = std::to_string(coupler.port());
    // The port named is the one the connection really went to, not 502.
    EXPECT_THAT(lines, Contains("Coupler: connecting to the coupler at 127.0.0.1:" + port));
    EXPECT_THAT(lines, Contains("Coupler: connected to the coupler at 127.0.0.1:" + port +
                                ", exception status 00"));
    EXPECT_THAT(lines, Contains("Coupler: reading IW300: MBTReadRegisters(3, 300, 1) failed: "
                                "status 2, Illegal data address"));
    const auto* failedRead = incidents.find("reading IW300");
    ASSERT_NE(failedRead, nullptr);
    EXPECT_EQ(failedRead->tag, "IW300");
    EXPECT_EQ(failedRead->endpoint, "127.0.0.1:" + port);
    EXPECT_THAT(lines, Contains("Coupler: reconnecting to the coupler at 127.0.0.1 (last "
                                "127.0.0.1:" +
                                port + ")"));
    EXPECT_THAT(lines, Contains("Coupler: disconnected from the coupler at 127.0.0.1:" + port));
    EXPECT_THAT(lines, Contains("Coupler: cannot connect to the coupler at 127.0.0.1:" + port +
                                ": status 261, Could not connect to the coupler (Connection "
                                "refused)"));
    EXPECT_TRUE(host.errors.empty());
}

TEST_F(WagoDiagnostics, AnErrorThatLeavesAPassIsTracedAndTheNextTickScansAgain) {
    test::IncidentRecorder incidents;
    const std::vector<std::string>& lines = incidents.lines;
    n = makeNode();
    scan({"IW0", "IWx"});
    tick();
    tick();
    // Connecting, connected, the tag flagged when added, then per pass the tag and the error.
    ASSERT_EQ(lines.size(), 7u) << ::testing::PrintToString(lines);
    EXPECT_EQ(lines[2],
              "Coupler: tag IWx: \"x\" is not a tag number: every scan pass stops at "
              "it with error 13 (Type mismatch), and the tags after it are not read");
    EXPECT_EQ(lines[3], "Coupler: tag IWx stops the pass: error 13 (Type mismatch)");
    EXPECT_EQ(lines[4], "Coupler: error 13 in Maroset.ClsDriverWagoIO: Type mismatch (127.0.0.1:" +
                            std::to_string(coupler.port()) + ")");
    EXPECT_EQ(lines[5], lines[3]);
    EXPECT_EQ(coupler.requests(), (std::vector<Request>{{kFc04, 0, 1}, {kFc04, 0, 1}}));
    EXPECT_TRUE(host.changes.empty());
}

TEST_F(WagoDiagnostics, AddTagFlagsTagsThatStopEveryPassOrThatNoReadPolls) {
    test::IncidentRecorder incidents;
    n = makeNode();
    scan({"IW0", "OW32700", "XW3"});
    EXPECT_TRUE(
        incidents.has("Coupler: tag OW32700: its read-back address 33212 passes 32767: "
                      "every scan pass stops at it with error 6 (Overflow), and the tags "
                      "after it are not read"));
    EXPECT_TRUE(
        incidents.has("Coupler: tag XW3: no read polls it: \"XW\" is none of IW, OW, "
                      "ID, OD"));
    EXPECT_EQ(incidents.find("tag OW32700:")->tag, "OW32700");
    tick();
    EXPECT_TRUE(incidents.has("Coupler: tag OW32700 stops the pass: error 6 (Overflow)"));
}

TEST_F(WagoDiagnostics, AnAddressThatIsNotADottedIpv4AddressIsHinted) {
    test::IncidentRecorder incidents;
    n = makeNode(Variant("localhost"));
    const auto* failed = incidents.find("cannot connect to the coupler at localhost:");
    ASSERT_NE(failed, nullptr) << ::testing::PrintToString(incidents.lines);
    EXPECT_NE(failed->text.find("; IPAddress \"localhost\" is not a dotted IPv4 address such as "
                                "192.168.1.10"),
              std::string::npos)
        << failed->text;
    EXPECT_EQ(failed->kind, platform::IncidentKind::OpenFailed);
}

TEST_F(WagoDiagnostics, WithTheTrapOnTheScanLogsUnderItsOwnLabel) {
    runtime().trap().setEnabled(true);
    n = makeNode();
    scan({"IWx"});
    tick();
    const std::string log = readDriveFile("MarosetErrors.txt");
    EXPECT_NE(log.find("Module\\Sub: ClsDriverWagoIO.FrmSelectTag.CmdOK_Click 0\r\n"),
              std::string::npos)
        << log;
    EXPECT_EQ(errorLogRecords(), 6u);  // retried until the burst passes 5, then skipped
}

}  // namespace
}  // namespace maroset::test
