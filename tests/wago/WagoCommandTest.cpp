// `maroset sim wago` as a user runs it: it prints where it listens, serves while it takes
// operator commands, and stops cleanly on Ctrl-C although it serves from a thread of its own.
#include <signal.h>

#include <gtest/gtest.h>

#include <array>
#include <regex>

#include "support/ChildProcess.h"
#include "platform/mbt/MbtLibrary.h"

namespace maroset::test {
namespace {

using std::chrono::milliseconds;

TEST(WagoSimCommand, ServesOnThePortItPrintsTakesCommandsAndStopsOnCtrlC) {
    ChildProcess sim({MAROSET_CLI_PATH, "sim", "wago", "--port", "0"});
    const auto header = sim.readLine(milliseconds(10000));
    ASSERT_TRUE(header);
    std::smatch m;
    ASSERT_TRUE(std::regex_match(
        *header, m, std::regex("WAGO coupler \\(Modbus/TCP\\) on 127\\.0\\.0\\.1:([0-9]+)")))
        << *header;
    const auto port = static_cast<uint16_t>(std::stoi(m[1]));
    for (int i = 0; i < 3; ++i) ASSERT_TRUE(sim.readLine(milliseconds(5000)));  // how to connect

    const auto answer = [&](const char* line) {
        sim.write(std::string(line) + "\n");
        return sim.readLine(milliseconds(5000)).value_or("(none)");
    };
    EXPECT_EQ(answer("motion off"), "inputs still");
    EXPECT_EQ(answer("iw 7 -2"), "input word 7 = -2");
    EXPECT_EQ(answer("iw 7"), "error: usage: iw N VALUE");
    EXPECT_EQ(answer("jump"), "error: unknown command 'jump' (type help)");

    platform::MbtLibrary mbt;
    platform::MbtLibrary::Handle handle = 0;
    mbt.MBTInit();
    ASSERT_EQ(mbt.MBTConnect("127.0.0.1", port, 0, 100, handle), 0) << mbt.LastErrorText();
    std::array<uint8_t, 2> word{};
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 3, 7, 1, word), 0);
    EXPECT_EQ(word, (std::array<uint8_t, 2>{0xFF, 0xFE}));

    sim.signal(SIGINT);
    EXPECT_EQ(sim.readLine(milliseconds(5000)), "Stopped.");
    EXPECT_EQ(sim.wait(milliseconds(5000)), 0);
}

}  // namespace
}  // namespace maroset::test
