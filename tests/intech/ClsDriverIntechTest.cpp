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
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using Fault = sim::IntechSimulator::Fault;

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
    FrmNUVIntech& line() { return *driver().NUVIntech(); }
    std::vector<std::string> pollList() {
        std::vector<std::string> out;
        for (int32_t i = 0; i <= line().PollCommandUBound(); ++i)
            out.push_back(line().PollCommand(i));
        return out;
    }
    // The host's reports since the last call, as (handle, value) pairs, in order.
    std::vector<std::pair<int32_t, Variant>> reported() {
        std::vector<std::pair<int32_t, Variant>> out;
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

using Reports = std::vector<std::pair<int32_t, Variant>>;

TEST_F(IntechDriver, TheLineIsAlwaysPort1At9600n81WhateverTheNodeSays) {
    auto n = std::make_shared<node>();
    n->Name = "Tank";
    n->DriverName = "nuvintech";
    n->SerialPort = Variant(int32_t{3});
    n->BaudRate = Variant(int32_t{19200});
    n->ScanRate = Variant(int32_t{250});
    n->Init();
    auto& drv = dynamic_cast<ClsDriverIntech&>(*n->driver());
    FrmNUVIntech& owner = *drv.NUVIntech();
    EXPECT_EQ(owner.CommPort(), 1);
    EXPECT_EQ(owner.CommSettings(), "9600,n,8,1");
    EXPECT_EQ(owner.CommTimeOut(), 1000);
    EXPECT_EQ(owner.ErrorCheckMode(), "BCC");
    EXPECT_EQ(owner.PLCNode(), 1);
    EXPECT_EQ(owner.TmrScanRate.Interval(), 250);
    EXPECT_FALSE(owner.TmrScanRate.Enabled());
    EXPECT_FALSE(owner.MSComm1.PortOpen()) << "the first send opens the port";
    EXPECT_EQ(owner.NodeName(), "Tank");

    n->AddTag(1, "01LDI1");
    n->IsActive(true);
    advance(250ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DI:E5\r") << "port 1 is /dev/ttyS0";
}

TEST_F(IntechDriver, TagsOfOneGroupShareACommandAndTheSearchLeavesAnEmptyEntry) {
    auto m = meter();
    EXPECT_FALSE(driver().AddItem("01LAI2", 7)) << "AddItem answers False, always";
    m->AddTag(8, "01LAI4");
    EXPECT_EQ(pollList(), (std::vector<std::string>{"@01EX E5 00:", ""}));
    EXPECT_EQ(driver().CommandCount(), 1);
    m->AddTag(9, "01LAI17");  // stored, no command
    m->AddTag(3, "01ldo1");   // polled, but never matches "01LDO1"
    EXPECT_EQ(pollList(), (std::vector<std::string>{"@01EX E5 00:", "@01EX DI:"}))
        << "the new command fills the empty entry";
    EXPECT_EQ(driver().TagCount(), 4);
    EXPECT_EQ(driver().TagNames().LBound(), 1);
    EXPECT_EQ(driver().TagNames().UBound(), 5);
    EXPECT_TRUE(driver().TagNames()(5).isEmpty()) << "the top entry stays empty";
    EXPECT_EQ(driver().TagHandles()(4), 3);
    m->AddTag(10, "02EAI33");
    EXPECT_EQ(pollList(), (std::vector<std::string>{"@01EX E5 00:", "@01EX DI:", "@02EX E3:"}));
    EXPECT_EQ(test::errorOf([&] { m->AddTag(11, "01LAIx"); }), 13);
    EXPECT_EQ(driver().TagCount(), 5) << "a failed range test stores nothing";

    station("01").setAnalog(1, 1.5f);  // keeps the reply's BCC sum above 15
    station("01").setAnalog(2, 2.5f);
    station("01").setAnalog(4, 4.0f);
    station("01").setOutput(1, true);
    station("02").setExtended(33, 4095);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{7, "2.5"}, {8, "4.0"}, {10, "4095"}}));
    ASSERT_EQ(recorder.changes.size(), 0u);
}

TEST_F(IntechDriver, OnlyChangedValuesGoUpAndEveryAddItemReportsEverythingAgain) {
    auto m = meter();
    m->AddTag(1, "01LAI1");
    m->AddTag(2, "01LDI3");
    m->AddTag(3, "01LDO2");
    station("01").setAnalog(1, 12.25f);
    station("01").setInput(3, true);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{1, "12.3"}, {3, int16_t(0)}, {2, int16_t(4)}}));
    advance(100ms);
    EXPECT_EQ(reported(), Reports{}) << "same texts, nothing to report";
    station("01").setAnalog(1, 12.26f);  // the same text with one decimal
    station("01").setOutput(2, true);
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{3, int16_t(2)}}));
    m->AddTag(4, "02LAI16");
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{1, "12.3"}, {3, int16_t(2)}, {2, int16_t(4)}, {4, "160.0"}}));
}

TEST_F(IntechDriver, TwoTagsOfOneNameAreBothReportedAndCaseOrLeadingZerosNeverMatch) {
    auto m = meter();
    m->AddTag(1, "01EAI5");
    m->AddTag(2, "01EAI5");
    m->AddTag(3, "01EAI05");
    m->AddTag(4, "01eai6");
    station("01").setExtended(5, 5);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{1, "5"}, {2, "5"}}));
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
    EXPECT_FALSE(station("01").output(2));
    EXPECT_EQ(cable.takeHostSent(), "") << "OK with the list at its start sends nothing";

    m->WriteTag("6", Variant(0.5));
    m->WriteTag("7", Variant(int16_t{1}));
    m->WriteTag("99", Variant(int16_t{1}));
    EXPECT_EQ(cable.takeHostSent(),
              "@02EX DO 0010.5 0000:10\r"
              "@EX DO 0011 0000:4C\r"
              "@EX DO 0011 0000:4C\r");
    EXPECT_EQ(test::errorOf([&] { m->WriteTag("5", Variant::Null()); }), 94);
    advance(0ms);  // the instrument answers ER to 0.5 and ignores the empty address

    // In the middle of a cycle, the write's OK sends the next poll command.
    db().StartScanning();
    instruments.setFault(Fault::Silence, 1);
    advance(100ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DI:E5\r");
    m->WriteTag("5", Variant(int16_t{0}));
    advance(0ms);
    EXPECT_EQ(cable.takeHostSent(), "@01EX DO 0010 0000:AC\r@02EX E5 00:53\r0\r");
    EXPECT_FALSE(station("01").output(1));
}

// Faults of the instrument: each costs the reply it hits, reports nothing, and the next tick
// recovers without any error going up to the host.
TEST_F(IntechDriver, EachReplyFaultIsDroppedAndTheNextTickRecovers) {
    auto m = meter();
    m->AddTag(1, "01LAI13");
    // 130.0 would make a reply whose BCC sum is below 16, which is never accepted.
    station("01").setAnalog(13, 131);
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(reported(), (Reports{{1, "131.0"}}));
    cable.takeHostSent();
    float value = 131;
    for (const Fault f :
         {Fault::Silence, Fault::BadBcc, Fault::Truncate, Fault::UnknownCode, Fault::LowSum}) {
        SCOPED_TRACE(static_cast<int>(f));
        station("01").setAnalog(13, ++value);
        instruments.setFault(f, 1);
        advance(100ms);
        EXPECT_EQ(reported(), Reports{});
        EXPECT_EQ(cable.takeHostSent(), "@01EX E5 03:55\r");
        advance(100ms);
        EXPECT_EQ(cable.takeHostSent(), "@01EX E5 03:55\r");
        EXPECT_EQ(reported(), (Reports{{1, Variant(std::to_string(int(value)) + ".0")}}));
    }
    EXPECT_TRUE(recorder.errors.empty()) << "a device problem is never reported upward";
}

TEST_F(IntechDriver, AHostMayDropTheNodeInsideItsValueChangeHandler) {
    auto m = meter();
    m->AddTag(1, "01LAI1");
    m->AddTag(2, "01LDI1");
    auto drop = recorder.host.ValueChange.subscribe(
        [&](VbArray<int32_t>&, int16_t, VbArray<Variant>&) { db().RemoveNode("Meter"); });
    m.reset();
    db().StartScanning();
    advance(100ms);
    EXPECT_EQ(recorder.changes.size(), 1u);
    EXPECT_EQ(db().count(), 0);
    EXPECT_EQ(cable.takeHostSent(), "@01EX E5 00:52\r") << "nothing goes out after the drop";
    advance(1s);
    EXPECT_EQ(cable.takeHostSent(), "");
}

TEST_F(IntechDriver, ShutdownClosesTheLineAndKeepsTheTagTable) {
    auto m = meter();
    m->AddTag(1, "01LAI1");
    db().StartScanning();
    advance(100ms);
    EXPECT_TRUE(line().MSComm1.PortOpen());
    auto drv = std::dynamic_pointer_cast<ClsDriverIntech>(m->driver());
    std::weak_ptr<FrmNUVIntech> owner = drv->NUVIntech();
    drv->shutdown();
    EXPECT_TRUE(owner.expired());
    EXPECT_EQ(drv->TagCount(), 1);
    EXPECT_EQ(test::errorOf([&] { drv->IsActive(true); }), 91);
    cable.takeHostSent();
    advance(1s);
    EXPECT_EQ(cable.takeHostSent(), "");
    // The contract's other operations do nothing and return their zero result.
    int32_t code = 5;
    EXPECT_EQ(drv->GetErrorString(code), "");
    EXPECT_EQ(drv->ReadItem(1), 0);
    EXPECT_EQ(drv->ReadAllItems(), 0);
    // Without its line a new tag is stored, then the poll list is not there.
    EXPECT_EQ(test::errorOf([&] { drv->AddItem("01LAI2", 2); }), 91);
    EXPECT_EQ(drv->TagCount(), 2);
}

}  // namespace
}  // namespace maroset
