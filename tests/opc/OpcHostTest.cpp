// The OPC node as a user meets it: `maroset run` with a project, and `maroset demo`, driving
// the built command in real time.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

class OpcHost : public ::testing::Test {
  protected:
    void SetUp() override {
        if (std::string(MAROSET_CLI_PATH).empty() || !std::filesystem::exists(MAROSET_CLI_PATH))
            GTEST_SKIP() << "the maroset command is not built";
    }

    // Runs `maroset ARGS` with `input` on standard input; standard output as lines.
    Lines run(const std::string& args, const std::string& input = "", int* status = nullptr) {
        const auto in = dir.path() / "in.txt";
        const auto out = dir.path() / "out.txt";
        std::ofstream(in) << input;
        const std::string command = std::string("'") + MAROSET_CLI_PATH + "' " + args + " < '" +
                                    in.string() + "' > '" + out.string() + "' 2> '" +
                                    (dir.path() / "err.txt").string() + "'";
        const int rc = std::system(command.c_str());
        if (status) *status = WIFEXITED(rc) ? WEXITSTATUS(rc) : -1;
        Lines lines;
        std::ifstream file(out);
        for (std::string line; std::getline(file, line);) lines.push_back(line);
        return lines;
    }
    std::string errors() const {
        std::ifstream file(dir.path() / "err.txt");
        return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
    }
    static bool has(const Lines& lines, const std::string& line) {
        return std::find(lines.begin(), lines.end(), line) != lines.end();
    }

    TempDir dir;
};

TEST_F(OpcHost, RunReportsRampsWhileScanningStaticsAfterWritesAndUnknownItems) {
    const std::string project = (dir.path() / "plant.db").string();
    run("project init '" + project + "'");
    run("project add '" + project +
        "' Opc OPC --opc-server Maroset.Simulation --update-rate 100 --tag-prefix Static.");
    run("project add '" + project +
        "' Ramps OPC --opc-server maroset.simulation --update-rate 100");
    int status = -1;
    const Lines out =
        run("run '" + project + "' --drive-root '" + (dir.path() / "c").string() + "' --trace",
            "add Ramps 61 Ramp.Seconds\n"
            "add Opc 62 Setpoint\n"
            "add Ramps 63 Foo.Bar\n"
            "start\n"
            "sleep 1500\n"
            "write Opc 62 42.5\n"
            "sleep 400\n"
            "stop\n"
            "write Opc 62 7\n"
            "sleep 400\n",
            &status);
    EXPECT_EQ(status, 0) << errors();
    const std::string all = ::testing::PrintToString(out);
    EXPECT_TRUE(has(out,
                    "DriverError  OPC Driver  ClsDriverOPC.AddItem: TagName: Foo.Bar Error: "
                    "The item ID is not defined in the server address space or no longer "
                    "exists in the server address space."))
        << all;
    EXPECT_TRUE(has(out, "ValueChange  61 = 0")) << all;
    EXPECT_TRUE(has(out, "ValueChange  61 = 1")) << all;
    EXPECT_TRUE(has(out, "ValueChange  62 = 0")) << all;
    EXPECT_TRUE(has(out, "ValueChange  62 = 42.5")) << all;
    EXPECT_FALSE(has(out, "ValueChange  62 = 7")) << all;  // written after stop: not reported
    EXPECT_EQ(out.back(), "quit: ok");
    EXPECT_NE(errors().find("trace Opc: DataChange 1 items"), std::string::npos) << errors();
}

TEST_F(OpcHost, DemoShowsTheOpcStation) {
    int status = -1;
    const Lines out = run("demo --seconds 2 --json", "", &status);
    ASSERT_EQ(status, 0) << errors();
    EXPECT_TRUE(has(out,
                    "{\"event\":\"ValueChange\",\"count\":2,\"handles\":[61,62],"
                    "\"values\":[0,50]}"))
        << ::testing::PrintToString(out);
    // The ramp's step and the next write fall due together: one data change or two.
    const std::string event = "{\"event\":\"ValueChange\",";
    EXPECT_TRUE(has(out, event + "\"count\":2,\"handles\":[61,62],\"values\":[1,60]}") ||
                (has(out, event + "\"count\":1,\"handles\":[61],\"values\":[1]}") &&
                 has(out, event + "\"count\":1,\"handles\":[62],\"values\":[60]}")))
        << ::testing::PrintToString(out);
}

}  // namespace
}  // namespace maroset::test
