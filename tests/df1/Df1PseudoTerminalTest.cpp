#include <gtest/gtest.h>

#include <chrono>
#include <memory>

#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "sim/df1/Df1Simulator.h"
#include "support/HostRecorder.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using namespace std::chrono_literals;

// The real loop and a real terminal line: the node opens the pseudo-terminal in raw mode at
// 19200,n,8,1, as it would open an adapter, and the simulated PLC answers on the other side.
TEST(Df1OnAPseudoTerminal, PollsWritesAndRidesOutAFaultInRealTime) {
    TempDir drive;
    ScopedRuntime rt(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                               std::make_unique<platform::SystemClock>(),
                                               drive.path()));
    platform::EventLoop& loop = rt->loop();
    auto plc = sim::Df1Simulator::OnPseudoTerminal(loop);
    plc->setWord("N7:10", 0x1010);
    rt->mapSerialPort(1, plc->endpoint(), "Line");
    HostRecorder recorder;
    auto db = recorder.host.nodeDB();
    db->AddNode("Line", "NUVABDF1", "", 100);
    db->getNode("Line")->AddTag(5, "N7:10");
    db->getNode("Line")->AddTag(6, "N7:11");
    db->StartScanning();
    auto runUntil = [&](size_t changes) {
        for (int i = 0; i < 40 && recorder.changes.size() < changes; ++i) loop.runFor(25ms);
        return recorder.changes.size() >= changes;
    };
    ASSERT_TRUE(runUntil(1)) << "no value within a second";
    EXPECT_EQ(recorder.changes[0].values, (std::vector<Variant>{int16_t{0x1010}, int16_t{0}}));

    plc->nakNext(1);  // resent once, then answered
    loop.runFor(150ms);
    db->getNode("Line")->WriteTag("6", Variant(int32_t{-5}));
    ASSERT_TRUE(runUntil(2));
    EXPECT_EQ(recorder.changes[1].handles, std::vector<int32_t>{6});
    EXPECT_EQ(recorder.changes[1].values, std::vector<Variant>{int16_t{-5}});
    EXPECT_EQ(plc->word("N7:11"), -5);
    db->RemoveAllNodes();
}

}  // namespace
}  // namespace maroset::test
