#include "sim/intech/IntechSimulator.h"

#include <gtest/gtest.h>

#include <string>

#include "IntechFrames.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"

namespace maroset::sim {
namespace {

using namespace std::chrono_literals;
using test::WithBcc;

// Stations "01" and "02" on a cable; the test is the host.
class IntechInstruments : public ::testing::Test {
  protected:
    IntechInstruments() {
        cable.hostEnd()->listen({[this](std::string_view b) { atHost.append(b); }, {}});
    }
    std::string ask(const std::string& framed, bool withBcc = true) {
        atHost.clear();
        cable.hostEnd()->write(withBcc ? WithBcc(framed) + "\r" : framed);
        loop.advance(0ms);
        return atHost;
    }

    platform::VirtualEventLoop loop;
    platform::MemorySerialCable cable{loop};
    IntechSimulator sim{loop, cable.deviceEnd(), "memory cable", {"01", "02"}};
    IntechInstrument& s = *sim.station("01");
    std::string atHost;
};

TEST_F(IntechInstruments, RepliesCarryEveryFieldWhereTheHostReadsIt) {
    for (int p = 9; p <= 12; ++p) s.setAnalog(p, p == 9 ? 100.0f : p == 10 ? 1.0f : -0.5f);
    EXPECT_EQ(ask("@01EX E5 02:"),
              WithBcc("@01EX E5 02 42C80000 3F800000 BF000000 BF000000:") + "\r");
    s.setOutput(1, true);
    s.setOutput(2, true);
    for (int p = 1; p <= 4; ++p) s.setInput(p, true);
    EXPECT_EQ(ask("@01EX DI:"), "@01EX DI 0003 0015:AE\r");
    for (int p = 17; p <= 32; ++p) s.setExtended(p, static_cast<uint32_t>(p - 17));
    s.setExtended(17, 1023);
    s.setExtended(32, 4095 + 4096);  // twelve bits
    EXPECT_EQ(ask("@01EX E2:"),
              WithBcc("@01EX E2 3FF 001 002 003 004 005 006 007 008 009 00A 00B 00C 00D 00E FFF:") +
                  "\r");
    EXPECT_EQ(ask("@01EX DO 0011 0000:AD\r", false), "@01OK:35\r");
    EXPECT_EQ(ask("@01EX DO 0020 0000:"), "@01OK:35\r");
    EXPECT_EQ(s.outputsWord(), 1);
    EXPECT_EQ(ask("@01EX DO 0010.5 0000:"), WithBcc("@01ER:") + "\r");
    // Another station's address, a bad BCC, an unknown command and noise get no answer.
    EXPECT_EQ(ask("@02EX DI:"), "@02EX DI 0000 0005:AB\r");
    for (const char* silent : {"@03EX DI:", "@01EX E5 04:", "@01EX DO 001 0000:"})
        EXPECT_EQ(ask(silent), "") << silent;
    EXPECT_EQ(ask("@01EX DI:E6\r", false), "");
    EXPECT_EQ(ask(std::string(1000, 'x') + "\r0\r", false), "");
    EXPECT_EQ(sim.ignored(), 6);
}

TEST_F(IntechInstruments, FaultsSpoilTheirRepliesAndGoAwayAfterTheirCount) {
    EXPECT_EQ(sim.command("fault truncate 2"), "fault truncate on the next 2 replies");
    EXPECT_EQ(ask("@01EX DI:"), "@01EX DI \r");
    EXPECT_EQ(ask("@02EX DI:"), "@02EX DI \r") << "the fault is the line's";
    EXPECT_EQ(ask("@01EX DI:"), "@01EX DI 0000 0005:AA\r");
    sim.setFault(IntechSimulator::Fault::LowSum, IntechSimulator::Always);
    for (const char* r : {"@01EX DI:", "@01EX E5 00:", "@01EX E4:", "@01EX DO 0011 0000:"}) {
        const std::string low = ask(r);  // padded to a sum of 0x0A, sent as two digits
        EXPECT_EQ(WithBcc(low.substr(0, low.size() - 3)) + "\r", low);
        EXPECT_EQ(low.find_first_of("@:", 1), low.size() - 4) << low;
        EXPECT_EQ(low.substr(low.size() - 3), "0A\r") << low;
    }
    EXPECT_EQ(sim.command("fault none"), "fault none");
    EXPECT_EQ(ask("@01EX DI:"), "@01EX DI 0001 0005:AB\r");
}

}  // namespace
}  // namespace maroset::sim
