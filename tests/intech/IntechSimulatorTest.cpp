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
    // The instrument's answer to one request line.
    std::string ask(const std::string& request) {
        atHost.clear();
        cable.hostEnd()->write(request);
        loop.advance(0ms);
        return atHost;
    }
    static std::string request(const std::string& framed) { return WithBcc(framed) + "\r"; }

    platform::VirtualEventLoop loop;
    platform::MemorySerialCable cable{loop};
    IntechSimulator sim{loop, cable.deviceEnd(), "memory cable", {"01", "02"}};
    std::string atHost;
};

TEST_F(IntechInstruments, ReadRepliesCarryEveryFieldWhereTheHostReadsIt) {
    IntechInstrument& s = *sim.station("01");
    s.setAnalog(9, 100.0f);
    s.setAnalog(10, 1.0f);
    s.setAnalog(11, -100.0f);
    s.setAnalog(12, 0.5f);
    EXPECT_EQ(ask(request("@01EX E5 02:")),
              WithBcc("@01EX E5 02 42C80000 3F800000 C2C80000 3F000000:") + "\r");

    s.setOutput(1, true);
    s.setOutput(2, true);
    for (int p = 1; p <= 4; ++p) s.setInput(p, true);
    EXPECT_EQ(ask(request("@01EX DI:")), "@01EX DI 0003 0015:AE\r");

    for (int p = 17; p <= 32; ++p) s.setExtended(p, static_cast<uint32_t>(p - 17));
    s.setExtended(17, 1023);
    s.setExtended(32, 4095 + 4096);  // twelve bits
    EXPECT_EQ(ask(request("@01EX E2:")),
              WithBcc("@01EX E2 3FF 001 002 003 004 005 006 007 008 009 00A 00B 00C 00D 00E FFF:") +
                  "\r");
    // Station 02 answers for itself; a station that is not there, a bad BCC, an unknown
    // command and line noise get no answer.
    EXPECT_EQ(ask(request("@02EX DI:")), "@02EX DI 0000 0005:AB\r");
    EXPECT_EQ(ask(request("@03EX DI:")), "");
    EXPECT_EQ(ask("@01EX DI:E6\r"), "");
    EXPECT_EQ(ask(request("@01EX E5 04:")), "");
    EXPECT_EQ(ask("0\r"), "");
    EXPECT_EQ(ask(std::string(1000, 'x') + "\r"), "");
    EXPECT_EQ(sim.ignored(), 5);
}

TEST_F(IntechInstruments, TheOutputWriteSwitchesTheNamedOutputAndIsAcknowledged) {
    IntechInstrument& s = *sim.station("01");
    EXPECT_EQ(ask("@01EX DO 0011 0000:AD\r"), "@01OK:35\r");
    EXPECT_TRUE(s.output(1));
    EXPECT_EQ(ask(request("@01EX DO 0021 0000:")), "@01OK:35\r");
    EXPECT_EQ(s.outputsWord(), 3);
    EXPECT_EQ(ask(request("@01EX DO 0010 0000:")), "@01OK:35\r");
    EXPECT_EQ(s.outputsWord(), 2);
    // Not a whole number, or an output it does not have: an error reply.
    const std::string er = WithBcc("@01ER:") + "\r";
    EXPECT_EQ(ask(request("@01EX DO 0010.5 0000:")), er);
    EXPECT_EQ(ask(request("@01EX DO 0031 0000:")), er);
    EXPECT_EQ(ask(request("@01EX DO 001 0000:")), "") << "no value at all is not a write";
    EXPECT_EQ(s.outputsWord(), 2);
}

TEST_F(IntechInstruments, FaultsSpoilTheirRepliesAndGoAwayAfterTheirCount) {
    const std::string good = ask(request("@01EX DI:"));
    ASSERT_EQ(good, "@01EX DI 0000 0005:AA\r");
    auto sum = [](const std::string& frame) {
        unsigned s = 0;
        for (size_t i = 1; i + 3 < frame.size(); ++i) s += static_cast<unsigned char>(frame[i]);
        return s & 255;
    };

    sim.setFault(IntechSimulator::Fault::Silence, 2);
    EXPECT_EQ(ask(request("@01EX DI:")), "");
    EXPECT_EQ(ask(request("@02EX DI:")), "") << "the fault is the line's";
    EXPECT_EQ(ask(request("@01EX DI:")), good);

    sim.setFault(IntechSimulator::Fault::BadBcc);
    EXPECT_EQ(ask(request("@01EX DI:")), "@01EX DI 0000 0005:AB\r");
    sim.setFault(IntechSimulator::Fault::Truncate);
    const std::string cut = ask(request("@01EX DI:"));
    EXPECT_EQ(cut.find(':'), std::string::npos) << cut;
    EXPECT_EQ(good.rfind(cut.substr(0, cut.size() - 1), 0), 0u) << "a beginning of the reply";
    sim.setFault(IntechSimulator::Fault::UnknownCode);
    EXPECT_EQ(ask(request("@01EX DI:")), WithBcc("@01ER:") + "\r");

    sim.setFault(IntechSimulator::Fault::LowSum, IntechSimulator::Always);
    for (const char* r : {"@01EX DI:", "@01EX E5 00:", "@01EX E4:", "@01EX DO 0011 0000:"}) {
        const std::string low = ask(request(r));
        ASSERT_GE(low.size(), 4u);
        EXPECT_EQ(low.substr(low.size() - 4), ":0A\r") << low;
        EXPECT_EQ(sum(low), 0x0Au) << low;
        EXPECT_EQ(low.find_first_of("@:", 1), low.size() - 4) << "no stray frame characters";
    }
    EXPECT_EQ(sim.command("fault none"), "fault none");
    EXPECT_EQ(ask(request("@01EX DI:")), "@01EX DI 0001 0005:AB\r");
}

TEST_F(IntechInstruments, OperatorCommandsSetAndShowValuesAndNeverThrow) {
    EXPECT_EQ(sim.command("set 01LAI3 12.5"), "ok");
    EXPECT_EQ(sim.station("01")->analog(3), 12.5f);
    EXPECT_EQ(sim.command("set 02eai64 4095"), "ok");
    EXPECT_EQ(sim.station("02")->extended(64), 4095);
    EXPECT_EQ(sim.command("set 01LDI4 1"), "ok");
    EXPECT_EQ(sim.command("get 01LDI4"), "01LDI4 = 1");
    EXPECT_EQ(sim.command("fault badbcc 3"), "fault badbcc on the next 3 replies");
    EXPECT_EQ(sim.fault(), IntechSimulator::Fault::BadBcc);
    EXPECT_NE(sim.command("status").find("fault badbcc (3 more)"), std::string::npos);
    for (const char* bad : {"set 01LAI17 1", "set 03LAI1 1", "set 01EAI1 4096", "set 01LAI1 x",
                            "set 01XYZ1 1", "get 01LAI", "fault melt", "fault code 0", "drift x",
                            "frobnicate", "set", "set 01LAI99999999999999999999 1"}) {
        const std::string answer = sim.command(bad);
        EXPECT_NE(answer, "ok") << bad;
        EXPECT_FALSE(answer.empty()) << bad;
    }
    EXPECT_NE(sim.help().find("fault KIND"), std::string::npos);
}

TEST_F(IntechInstruments, DriftMovesEveryKindOfValue) {
    IntechInstrument& s = *sim.station("01");
    const float lai = s.analog(1);
    const uint16_t eai = s.extended(1);
    const int inputs = s.inputsWord();
    sim.setDrift(1000);
    loop.advance(2000ms);
    EXPECT_NE(s.analog(1), lai);
    EXPECT_NE(s.extended(1), eai);
    EXPECT_NE(s.inputsWord(), inputs);
    sim.setDrift(0);
    const float still = s.analog(1);
    loop.advance(5000ms);
    EXPECT_EQ(s.analog(1), still);
}

}  // namespace
}  // namespace maroset::sim
