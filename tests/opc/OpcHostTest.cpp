// An OPC node as a user meets it: `maroset run` with a project on the simulated server,
// driving the built command in real time.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <regex>
#include <string>
#include <vector>

#include "support/TempDir.h"

namespace maroset::test {
namespace {

TEST(OpcHost, RunReportsRampsWhileScanningStaticsAfterWritesAndUnknownItems) {
    const std::string cli = MAROSET_CLI_PATH;
    if (cli.empty() || !std::filesystem::exists(cli)) GTEST_SKIP() << "maroset is not built";
    TempDir dir;
    const std::string p = "'" + (dir.path() / "p.db").string() + "'";
    const std::string add = "'" + cli + "' project add " + p + " ";
    ASSERT_EQ(
        std::system(("'" + cli + "' project init " + p + " >/dev/null && " + add +
                     "Opc OPC --opc-server Maroset.Simulation --update-rate 100 "
                     "--tag-prefix Static. >/dev/null && " +
                     add + "Ramps OPC --opc-server maroset.simulation --update-rate 100 >/dev/null")
                        .c_str()),
        0);
    std::ofstream(dir.path() / "in") << "add Ramps 61 Ramp.Seconds\nadd Opc 62 Setpoint\n"
                                        "add Ramps 63 Foo.Bar\nstart\nsleep 1500\n"
                                        "write Opc 62 42.5\nsleep 400\nstop\n"
                                        "write Opc 62 7\nsleep 400\n";
    const auto out = dir.path() / "out";
    ASSERT_EQ(
        std::system(("'" + cli + "' run " + p + " --drive-root '" + (dir.path() / "c").string() +
                     "' --trace < '" + (dir.path() / "in").string() + "' > '" + out.string() +
                     "' 2> '" + (dir.path() / "err").string() + "'")
                        .c_str()),
        0);
    std::vector<std::string> lines;
    std::ifstream file(out);
    for (std::string line; std::getline(file, line);) lines.push_back(line);
    const auto has = [&](const std::string& l) {
        return std::find(lines.begin(), lines.end(), l) != lines.end();
    };
    EXPECT_TRUE(
        has("DriverError  OPC Driver  ClsDriverOPC.AddItem: TagName: Foo.Bar Error: The "
            "item ID is not defined in the server address space or no longer exists in "
            "the server address space."));
    for (const char* seen : {"ValueChange  61 = 0", "ValueChange  61 = 1", "ValueChange  62 = 0",
                             "ValueChange  62 = 42.5"})
        EXPECT_TRUE(has(seen)) << seen << "\n" << ::testing::PrintToString(lines);
    EXPECT_FALSE(has("ValueChange  62 = 7"));  // written after stop: not reported
    EXPECT_EQ(lines.back(), "quit: ok");
    std::ifstream err(dir.path() / "err");
    const std::string trace{std::istreambuf_iterator<char>(err), {}};
    EXPECT_TRUE(std::regex_search(
        trace, std::regex("trace Opc: [0-9]{2}:[0-9]{2}:[0-9]{2}\\.[0-9]{3} DataChange 1 items")))
        << trace;
}

}  // namespace
}  // namespace maroset::test
