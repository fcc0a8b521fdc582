#include "drivers/df1/ClsDriverNuvAbDf1.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "Df1Line.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "sim/df1/Df1Simulator.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/IncidentRecorder.h"

namespace maroset::test {
namespace {

// A NUVABDF1 node scanning every 500 ms, its port 1 wired to the simulated PLC.
class Df1Node : public Df1LineFixture {
  protected:
    Df1Node() {
        db->AddNode("PLC", "NUVABDF1", "", 500);
        plc = db->getNode("PLC");
    }
    ClsDriverNuvAbDf1& driver() { return dynamic_cast<ClsDriverNuvAbDf1&>(*plc->driver()); }
    // One scan: the poll goes out and the reply comes back.
    void scan() { advance(500ms); }
    // The handles and values of the last report.
    std::vector<int32_t> lastHandles() const { return recorder.changes.back().handles; }
    std::vector<Variant> lastValues() const { return recorder.changes.back().values; }

    HostRecorder recorder;
    sim::Df1Simulator sim{loop(), cable.deviceEnd()};
    std::shared_ptr<nodeDB> db = recorder.host.nodeDB();
    std::shared_ptr<node> plc;
};

TEST_F(Df1Node, PollsTheSpanOfItsTagsAsOneBlockFromTheLowest) {
    sim.setWord("N7:2", 20);
    sim.setWord("N7:5", 50);
    sim.setWord("N7:9", -9);
    plc->AddTag(1, "N7:5");
    plc->AddTag(2, "N7:2");
    plc->AddTag(3, "n7:9");
    EXPECT_EQ(driver().Offsets().items(), (std::vector<int16_t>{0, 3, 7}));
    EXPECT_EQ(driver().ClientHandles().items(), (std::vector<int16_t>{2, 1, 3}));
    db->StartScanning();
    scan();
    // Read 8 words (16 bytes) of N7 from element 2.
    EXPECT_EQ(sim.lastRequest(), Bytes({1, 0, 0x0F, 0, 1, 0, 0xA2, 16, 7, 0x89, 2, 0}));
    ASSERT_EQ(recorder.changes.size(), 1u);
    EXPECT_EQ(recorder.changes[0].count, 3);
    EXPECT_EQ(recorder.changes[0].handlesLower, 1);
    EXPECT_EQ(lastHandles(), (std::vector<int32_t>{2, 1, 3}));
    EXPECT_EQ(lastValues(), (std::vector<Variant>{int16_t{20}, int16_t{50}, int16_t{-9}}));

    // Only what changed is reported; nothing at all when nothing changed.
    scan();
    EXPECT_EQ(recorder.changes.size(), 1u);
    sim.setWord("N7:9", 0x1010);  // goes over the line as doubled DLEs
    scan();
    ASSERT_EQ(recorder.changes.size(), 2u);
    EXPECT_EQ(lastHandles(), std::vector<int32_t>{3});
    EXPECT_EQ(lastValues(), std::vector<Variant>{int16_t{0x1010}});

    db->StopScanning();
    scan();
    EXPECT_EQ(sim.counters().framesReceived, 3);
}

TEST_F(Df1Node, TakesOnlyN7TagsAndReportsEveryTagAgainAfterAnAddition) {
    plc->AddTag(1, "N7:0");
    for (const char* ignored : {"N10:0", "B3:0", "N7:x", "N7:", "F8:1"}) plc->AddTag(9, ignored);
    EXPECT_EQ(driver().TagAddresses().size(), 1);
    EXPECT_EQ(driver().BlockWordCount(), 1);
    db->StartScanning();
    scan();
    EXPECT_EQ(sim.lastRequest()[7], 2) << "a single tag reads one word";
    EXPECT_EQ(lastValues(), std::vector<Variant>{int16_t{0}}) << "the first read reports 0 too";

    plc->AddTag(2, "N7;0");  // the same element, and the other separator
    scan();
    EXPECT_EQ(lastHandles(), (std::vector<int32_t>{1, 2}));
    EXPECT_EQ(recorder.changes.size(), 2u);
}

TEST_F(Df1Node, WritesGoOutAtOnceAndAnUnknownHandleWritesToTheLastPolledAddress) {
    plc->AddTag(1, "N7:3");
    plc->AddTag(2, "N7:6");
    plc->WriteTag("1", Variant(int32_t{-2}));
    advance(0ms);
    EXPECT_EQ(sim.word("N7:3"), -2);
    EXPECT_EQ(sim.lastRequest(), Bytes({1, 0, 0x0F, 0, 1, 0, 0xAA, 2, 7, 0x89, 3, 0, 0xFE, 0xFF}));

    db->StartScanning();
    scan();
    plc->WriteTag("2", Variant(int32_t{600}));
    plc->WriteTag("77", Variant(int32_t{7}));  // lost: the first write still awaits its ACK
    advance(0ms);
    EXPECT_EQ(sim.word("N7:6"), 600);
    plc->WriteTag("77", Variant(int32_t{7}));
    advance(0ms);
    EXPECT_EQ(sim.word("N7:6"), 7) << "the address set last was N7:6";
    EXPECT_EQ(errorOf([&] { plc->WriteTag("1", Variant("many")); }), 13);
    EXPECT_EQ(errorOf([&] { plc->WriteTag("1", Variant(int32_t{40000})); }), 6);
}

TEST_F(Df1Node, LinkFaultsStayInsideAndTheNextPollRecovers) {
    test::IncidentRecorder incidents;
    const std::vector<std::string>& lines = incidents.lines;
    plc->AddTag(1, "N7:1");
    sim.setWord("N7:1", 11);
    sim.nakNext(4);
    db->StartScanning();
    scan();
    EXPECT_TRUE(recorder.changes.empty());
    scan();
    EXPECT_EQ(recorder.changes.size(), 1u);

    sim.setWord("N7:1", 12);
    sim.corruptNextReplies(1);  // NAKed, then sent again right
    scan();
    EXPECT_EQ(lastValues(), std::vector<Variant>{int16_t{12}});
    EXPECT_TRUE(recorder.errors.empty());

    auto has = [&](const std::string& text) {
        for (const auto& l : lines)
            if (l.find(text) != std::string::npos) return true;
        return false;
    };
    EXPECT_TRUE(has("PLC: Complete level 4: Receivied NAK - Aborting message"));
    EXPECT_TRUE(has("PLC: Complete level 3: Received Bad CRC  "));
    EXPECT_TRUE(has("PLC: received 10 15"));
    EXPECT_TRUE(has("PLC: sent 10 15"));
}

TEST_F(Df1Node, UsesPortOneAndItsOwnMappingAndRetriesADeadPortOnEveryPoll) {
    test::IncidentRecorder incidents;
    const std::vector<std::string>& lines = incidents.lines;
    plc->SerialPort = Variant(int16_t{4});  // held only
    runtime().mapSerialPort(1, "/dev/plc-adapter", "plc");
    plc->AddTag(1, "N7:0");
    db->StartScanning();
    scan();
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines.back().rfind("PLC: error 8002", 0), 0u) << lines.back();
    EXPECT_NE(lines.back().find("/dev/plc-adapter"), std::string::npos);

    runtime().serialDevices().plug("/dev/plc-adapter", cable.hostEnd());  // plugged in
    scan();
    EXPECT_EQ(recorder.changes.size(), 1u);
}

TEST_F(Df1Node, AHostMayDropTheNodeFromInsideItsValueChange) {
    auto drop = recorder.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { db->RemoveNode("PLC"); });
    plc->AddTag(1, "N7:0");
    db->StartScanning();
    plc.reset();
    scan();
    EXPECT_EQ(db->count(), 0);
    advance(5s);
    EXPECT_EQ(sim.counters().framesReceived, 1);
}

}  // namespace
}  // namespace maroset::test
