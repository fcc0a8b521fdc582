#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <memory>

#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "platform/Timer.h"
#include "platform/serial/PseudoTerminal.h"
#include "sim/df1/Df1Simulator.h"
#include "sim/intech/IntechSimulator.h"
#include "support/HostRecorder.h"
#include "support/IncidentRecorder.h"
#include "support/TempDir.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

// Real time on pseudo-terminals: an Intech and a DF1 node polling as fast as they can two
// devices that stop reading, and a memory-tag node on the same host written every 10 ms.
TEST(DeafSerialDevice, CostsTheOtherNodesNothingAndLosesNoInputOnceItReadsAgain) {
    test::TempDir root;
    ScopedRuntime rt(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                               std::make_unique<platform::SystemClock>(),
                                               root.path()));
    platform::EventLoop& loop = rt->loop();
    // Nobody reads the device ends yet: the terminals' buffers fill and stay full.
    platform::PseudoTerminal meterLine(loop), plcLine(loop);
    rt->mapSerialPort(1, meterLine.path(), "Meter");
    rt->mapSerialPort(1, plcLine.path(), "Plc");
    test::HostRecorder recorder;
    test::IncidentRecorder incidents;
    nodeDB& db = *recorder.host.nodeDB();
    db.AddNode("Meter", "NUVINTECH", "", 1);
    db.AddNode("Plc", "NUVABDF1", "", 1);
    db.AddNode("Mem", "MEMTAG");
    db.getNode("Meter")->AddTag(1, "01EAI1");
    db.getNode("Plc")->AddTag(2, "N7:0");
    auto mem = db.getNode("Mem");
    mem->AddTag(3, "M1");
    db.StartScanning();

    // A write every 10 ms; the longest wait between two answered writes is what a deaf
    // device costs the host (a blocking write cost a whole second).
    platform::Timer writer(loop);
    writer.Interval(10);
    int32_t written = 0;
    size_t answered = 0;
    auto lastAnswer = Clock::now();
    Clock::duration longestWait{};
    auto tick = writer.Tick.subscribe([&] {
        mem->WriteTag("3", Variant(++written));
        for (; answered < recorder.changes.size(); ++answered) {
            const auto now = Clock::now();
            longestWait = std::max(longestWait, now - lastAnswer);
            lastAnswer = now;
        }
    });
    writer.Enabled(true);
    loop.runFor(10s);
    writer.Enabled(false);

    EXPECT_GT(written, 500);
    EXPECT_LT(longestWait, 200ms) << "the loop stalled on a serial write";
    EXPECT_TRUE(incidents.has("Meter: not sent, " + meterLine.path() + " takes no output"))
        << "the meter's terminal never filled: the test proves nothing";
    EXPECT_EQ(incidents.count("opened port"), 2u) << "both ports stayed open";
    EXPECT_EQ(incidents.count("line broken"), 0u);

    // The devices start reading: the queued commands go out, and replies reach the host.
    recorder.changes.clear();
    sim::IntechSimulator meter(loop, meterLine.deviceEnd(), meterLine.path(), {"01"});
    meter.station("01")->setExtended(1, 4095);
    sim::Df1Simulator plc(loop, plcLine.deviceEnd(), plcLine.path());
    plc.setWord("N7:0", 77);
    auto valueOf = [&](int32_t handle) -> Variant {
        Variant last;
        for (const auto& c : recorder.changes)
            for (size_t k = 0; k < c.handles.size(); ++k)
                if (c.handles[k] == handle) last = c.values[k];
        return last;
    };
    for (int i = 0; i < 250 && (valueOf(1).isEmpty() || valueOf(2).isEmpty()); ++i)
        loop.runFor(20ms);
    EXPECT_EQ(valueOf(1), Variant("4095"));
    EXPECT_EQ(valueOf(2), Variant(int16_t{77}));
    EXPECT_EQ(incidents.count("opened port"), 2u) << "no reopen, so no waiting input was flushed";
    db.RemoveAllNodes();
}

}  // namespace
}  // namespace maroset
