#include <gtest/gtest.h>

#include <chrono>
#include <memory>

#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "sim/intech/IntechSimulator.h"
#include "support/HostRecorder.h"
#include "support/TempDir.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;

// The real thing: a NUVINTECH node on a pseudo-terminal, the instruments on its other side,
// the poll loop in real time.
TEST(IntechOverPseudoTerminal, ANodePollsTheInstrumentsAndWritesItsOutput) {
    test::TempDir root;
    ScopedRuntime rt(std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                               std::make_unique<platform::SystemClock>(),
                                               root.path()));
    auto instruments = sim::IntechSimulator::OnPseudoTerminal(rt->loop(), {"01", "02"});
    instruments->station("02")->setExtended(64, 4095);
    rt->mapSerialPort(1, instruments->endpoint(), "Meter");
    test::HostRecorder recorder;
    nodeDB& db = *recorder.host.nodeDB();
    db.AddNode("Meter", "NUVINTECH", "", 20);
    auto meter = db.getNode("Meter");
    meter->AddTag(1, "01LDO1");
    meter->AddTag(2, "02EAI64");
    db.StartScanning();

    // Waits up to 2 s for the value to reach the host.
    auto waitFor = [&](int32_t handle, const Variant& value) {
        for (int i = 0; i < 100; ++i, rt->loop().runFor(20ms))
            for (const auto& c : recorder.changes)
                for (size_t k = 0; k < c.handles.size(); ++k)
                    if (c.handles[k] == handle && c.values[k] == value) return true;
        return false;
    };
    EXPECT_TRUE(waitFor(2, Variant("4095")));
    EXPECT_TRUE(waitFor(1, Variant(int16_t{0})));
    meter->WriteTag("1", Variant(int16_t{1}));
    EXPECT_TRUE(waitFor(1, Variant(int16_t{1})));
    EXPECT_TRUE(instruments->station("01")->output(1));
    EXPECT_GE(instruments->replies(), 3);
    db.RemoveAllNodes();
}

}  // namespace
}  // namespace maroset
