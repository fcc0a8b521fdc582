#include "drivers/intech/ClsDriverIntech.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "core/node.h"
#include "core/nodeDB.h"
#include "drivers/intech/FrmNUVIntech.h"
#include "platform/serial/MemorySerialCable.h"
#include "sim/intech/IntechSimulator.h"
#include "support/ErrorOf.h"
#include "support/HostRecorder.h"
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using Fault = sim::IntechSimulator::Fault;
using Reports = std::vector<std::pair<int32_t, Variant>>;
using Texts = std::vector<std::string>;

// A NUVINTECH node "Meter" polling every 100 ms, instruments "01" and "02" on an in-memory
// cable at port 1's device, and a host recording what it receives.
class IntechDriver : public test::RuntimeFixture {
  protected:
    IntechDriver() {
        runtime().serialDevices().plug("/dev/ttyS0", cable.hostEnd());
        db().AddNode("Meter", "NUVINTECH", "", 100);
    }
    nodeDB& db() { return *recorder.host.nodeDB(); }
    std::shared_ptr<node> meter() { return db().getNode("Meter"); }
    ClsDriverIntech& driver() { return dynamic_cast<ClsDriverIntech&>(*meter()->driver()); }
    Texts pollList() {
        FrmNUVIntech& line = *driver().NUVIntech();
        Texts out;
        for (int32_t i = 0; i <= line.PollCommandUBound(); ++i) out.push_back(line.PollCommand(i));
        return out;
    }
    // The host's reports since the last call as (handle, value), in order.
    Reports reported() {
        Reports out;
        for (const auto& c : recorder.changes) {
            EXPECT_EQ(c.handlesLower, 1);
            EXPECT_EQ(c.count, static_cast<int16_t>(c.handles.size()));
            for (size_t i = 0; i < c.handles.size(); ++i)
                out.emplace_back(c.handles[i], c.values[i]);
        }
        recorder.changes.clear();
        return out;
    }
    sim::IntechInstrument& station(const char* address) { return *instruments.station(address); }

    test::HostRecorder recorder;
    platform::MemorySerialCable cable{loop()};
    sim::IntechSimulator instruments{loop(), cable.deviceEnd(), "memory cable", {"01", "02"}};
};

TEST_F(IntechDriver, TheLineIsAlwaysPort1At9600n81WhateverTheNodeSays) {
    auto n = std::make_shared<node>();
    n->Name = "Tank";
    n->DriverName = "nuvintech";
    n->SerialPort = Variant(int32_t{3});
    n->BaudRate = Variant(int32_t{19200});
    n->ScanRate = Variant(int32_t{250});
    n->Init();
    FrmNUVIntech& owner = *dynamic_cast<ClsDriverIntech&>(*n->driver()).NUVIntech();
    EXPECT_EQ(owner.CommPort(), 1);
    EXPECT_EQ(owner.CommSettings(), "9600,n,8,1");
    EXPECT_EQ(owner.CommTimeOut(), 1000);
    EXPECT_EQ(owner.ErrorCheckMode(), "BCC");
    EXPECT_EQ(owner.TmrScanRate.Interval(), 250);
    EXPECT_FALSE(owner.TmrScanRate.Enabled());
    EXPECT_FALSE(owner.MSComm1.PortOpen()) << "the first send opens the port";
    n->AddTag(1, "01LDI1");
    n->IsActive(true);
    advance(250ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DI:E5\r") << "port 1 is /dev/ttyS0";
}

TEST_F(IntechDriver, TagsOfOneGroupShareACommandAndTheSearchLeavesAnEmptyEntry) {
    auto m = meter();
    EXPECT_FALSE(driver().AddItem("01LAI2", 7)) << "AddItem answers False, always";
    m->AddTag(8, "01LAI4");
    EXPECT_EQ(pollList(), (Texts{"@01EX E5 00:", ""}));
    m->AddTag(9, "01LAI17");  // stored, no command
    m->AddTag(3, "01ldo1");   // polled, but never matches the decoded "01LDO1"
    EXPECT_EQ(pollList(), (Texts{"@01EX E5 00:", "@01EX DI:"})) << "the new command fills it";
    m->AddTag(10, "02EAI33");
    EXPECT_EQ(pollList(), (Texts{"@01EX E5 00:", "@01EX DI:", "@02EX E3:"}));
    EXPECT_EQ(test::errorOf([&] { m->AddTag(11, "01LAIx"); }), 13);
    EXPECT_EQ(driver().TagCount(), 5) << "a failed range test stores nothing";
    EXPECT_EQ(driver().TagNames().UBound(), 6);
    EXPECT_TRUE(driver().TagNames()(6).isEmpty()) << "the top entry stays empty";

    station("01").setAnalog(1, 1.5f);  // keeps the reply's BCC sum above 15
    station("01").setAnalog(2, 2.5f);
    station("01").setAnalog(4, 4.0f);
    station("01").setOutput(1, true);
    station("02").setExtended(33, 4095);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{7, "2.5"}, {8, "4.0"}, {10, "4095"}}));
}

TEST_F(IntechDriver, AddTagFlagsATagNoPollCommandReads) {
    test::IncidentRecorder incidents;
    auto m = meter();
    m->AddTag(9, "01LAI17");
    m->AddTag(8, "01LAI4");
    ASSERT_EQ(incidents.entries.size(), 1u) << ::testing::PrintToString(incidents.lines);
    EXPECT_EQ(incidents.entries[0].tag, "01LAI17");
    EXPECT_NE(incidents.entries[0].text.find("tag 01LAI17: no poll command reads it"),
              std::string::npos);
}

TEST_F(IntechDriver, OnlyChangedTextsGoUpAndEveryAddItemReportsEverythingAgain) {
    auto m = meter();
    m->AddTag(1, "01LAI1");
    m->AddTag(2, "01LDI3");
    m->AddTag(3, "01LDO2");
    m->AddTag(4, "01LDI3");   // one name, two handles: both reported
    m->AddTag(5, "01LAI01");  // never matches "01LAI1"
    station("01").setAnalog(1, 12.25f);
    station("01").setInput(3, true);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(),
              (Reports{{1, "12.3"}, {3, int16_t(0)}, {2, int16_t(4)}, {4, int16_t(4)}}));
    station("01").setAnalog(1, 12.26f);  // the same text with one decimal
    advance(100ms);
    EXPECT_EQ(reported(), Reports{});
    station("01").setOutput(2, true);
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{3, int16_t(2)}}));
    m->AddTag(6, "02LAI16");
    advance(100ms);
    EXPECT_EQ(
        reported(),
        (Reports{{1, "12.3"}, {3, int16_t(2)}, {2, int16_t(4)}, {4, int16_t(4)}, {6, "160.0"}}));
}

TEST_F(IntechDriver, WritesSendTheOutputCommandForAnyTagAndAnAcknowledgementContinues) {
    auto m = meter();
    m->AddTag(5, "01LDO2");
    m->AddTag(6, "02LAI1");
    m->AddTag(7, "01LD");
    m->WriteTag("5", Variant(int16_t{1}));
    advance(0ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DO 0011 0000:AD\r");
    EXPECT_TRUE(station("01").output(1)) << "the output number is always 001";
    m->WriteTag("6", Variant(0.5));
    m->WriteTag("7", Variant(int16_t{1}));
    m->WriteTag("99", Variant(int16_t{1}));
    EXPECT_EQ(cable.takeHostSent(),
              "@02EX DO 0010.5 0000:10\r@EX DO 0011 0000:4C\r@EX DO 0011 0000:4C\r");
    m->WriteTag("5", Variant::Null());
    m->WriteTag("5", Variant(true));
    EXPECT_EQ(cable.takeHostSent(), "@01EX DO 001 0000:7C\r@01EX DO 001True 0000:1C\r");
    EXPECT_EQ(test::errorOf([&] { m->WriteTag("5", Variant(VbArray<Variant>(0, 1))); }), 13);
    advance(0ms);

    // In the middle of a cycle the write's OK sends the next poll command.
    db().StartScanning();
    instruments.setFault(Fault::Silence, 1);
    advance(100ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DI:E5\r");
    m->WriteTag("5", Variant(int16_t{0}));
    advance(0ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DO 0010 0000:AC\r@02EX E5 00:53\r0\r");
}

TEST_F(IntechDriver, EachReplyFaultIsDroppedSilentlyAndTheNextTickRecovers) {
    meter()->AddTag(1, "01LAI13");
    station("01").setAnalog(13, 131);  // 130.0 would make a BCC sum below 16
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{1, "131.0"}}));
    int value = 131;
    for (const Fault f :
         {Fault::Silence, Fault::BadBcc, Fault::Truncate, Fault::UnknownCode, Fault::LowSum}) {
        SCOPED_TRACE(static_cast<int>(f));
        station("01").setAnalog(13, static_cast<float>(++value));
        instruments.setFault(f, 1);
        advance(100ms);
        EXPECT_EQ(reported(), Reports{});
        advance(100ms);
        EXPECT_EQ(reported(), (Reports{{1, Variant(std::to_string(value) + ".0")}}));
    }
    EXPECT_TRUE(recorder.errors.empty()) << "device problems are never reported upward";
}

TEST_F(IntechDriver, AHostMayDropTheNodeInsideItsValueChangeHandler) {
    meter()->AddTag(1, "01LAI1");
    meter()->AddTag(2, "01LDI1");
    auto drop = recorder.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { db().RemoveNode("Meter"); });
    db().StartScanning();
    advance(1s);
    EXPECT_EQ(recorder.changes.size(), 1u);
    EXPECT_EQ(cable.takeHostSent(), "@01EX E5 00:52\r") << "nothing goes out after the drop";
}

TEST_F(IntechDriver, ShutdownClosesTheLineAndKeepsTheTagTable) {
    meter()->AddTag(1, "01LAI1");
    auto drv = std::dynamic_pointer_cast<ClsDriverIntech>(meter()->driver());
    db().StartScanning();
    advance(100ms);
    std::weak_ptr<FrmNUVIntech> owner = drv->NUVIntech();
    drv->shutdown();
    EXPECT_TRUE(owner.expired());
    EXPECT_EQ(test::errorOf([&] { drv->IsActive(true); }), 91);
    EXPECT_EQ(test::errorOf([&] { drv->AddItem("01LAI2", 2); }), 91);
    EXPECT_EQ(drv->TagCount(), 2) << "stored before the missing line fails the search";
    cable.takeHostSent();
    advance(1s);
    EXPECT_EQ(cable.takeHostSent(), "");
}

}  // namespace
}  // namespace maroset
