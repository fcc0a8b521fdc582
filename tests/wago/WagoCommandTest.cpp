// The coupler through the maroset command: `maroset sim wago` in one process, `maroset run`
// with a WAGOIO node in another, as a user commissioning a line would run them.
#include <signal.h>

#include <gtest/gtest.h>

#include <regex>
#include <string>
#include <vector>

#include "ChildProcess.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using std::chrono::milliseconds;

std::vector<std::string> readAll(ChildProcess& p) {
    std::vector<std::string> lines;
    while (auto line = p.readLine(milliseconds(10000))) lines.push_back(*line);
    return lines;
}

bool contains(const std::vector<std::string>& lines, const std::string& text) {
    for (const auto& l : lines)
        if (l.find(text) != std::string::npos) return true;
    return false;
}

class WagoCommand : public ::testing::Test {
  protected:
    void SetUp() override {
        const auto header = sim.readLine(milliseconds(10000));
        ASSERT_TRUE(header) << sim.errors();
        std::smatch m;
        ASSERT_TRUE(std::regex_search(*header, m,
                                      std::regex("^WAGO coupler \\(Modbus/TCP\\) on "
                                                 "127\\.0\\.0\\.1:([0-9]+)$")))
            << *header;
        port = m[1];
        // How to connect, then the prompt for commands.
        ASSERT_TRUE(sim.readLine(milliseconds(5000)));
        ASSERT_TRUE(sim.readLine(milliseconds(5000)));
        ASSERT_TRUE(sim.readLine(milliseconds(5000)));
        simCommand("motion off", "inputs still");

        project = (scratch.path() / "plant.db").string();
        for (const std::vector<std::string>& args :
             {std::vector<std::string>{"project", "init", project},
              std::vector<std::string>{"project", "add", project, "Coupler", "WAGOIO",
                                       "--ip-address", "127.0.0.1", "--update-rate", "100",
                                       "--port", "1502"}}) {
            std::vector<std::string> argv{MAROSET_CLI_PATH};
            argv.insert(argv.end(), args.begin(), args.end());
            ChildProcess p(argv);
            ASSERT_EQ(p.wait(milliseconds(10000)), 0) << p.errors();
        }
    }
    void TearDown() override {
        sim.signal(SIGINT);
        EXPECT_EQ(sim.readLine(milliseconds(5000)), "Stopped.");
        EXPECT_EQ(sim.wait(milliseconds(5000)), 0);
    }

    void simCommand(const std::string& line, const std::string& answer) {
        sim.write(line + "\n");
        EXPECT_EQ(sim.readLine(milliseconds(5000)), answer) << line;
    }

    // `maroset run` on the project with the given extra options and commands.
    std::vector<std::string> run(const std::vector<std::string>& options, const std::string& input,
                                 std::string* errors = nullptr) {
        std::vector<std::string> argv{
            MAROSET_CLI_PATH,        "run",           project, "--drive-root",
            scratch.path().string(), "--modbus-port", port};
        argv.insert(argv.end(), options.begin(), options.end());
        ChildProcess p(argv);
        p.write(input);
        p.closeInput();
        auto lines = readAll(p);
        EXPECT_EQ(p.wait(milliseconds(10000)), 0) << p.errors();
        if (errors) *errors = p.errors();
        return lines;
    }

    ChildProcess sim{{MAROSET_CLI_PATH, "sim", "wago"}};
    TempDir scratch;
    std::string port;
    std::string project;
};

TEST_F(WagoCommand, TheHostSeesInputsAndItsWritesComeBackThroughTheReadBack) {
    simCommand("iw 0 4242", "input word 0 = 4242");
    simCommand("id 19 1", "input bit 19 = 1");
    const auto lines = run({},
                           "add Coupler 51 IW0\n"
                           "add Coupler 52 ID1.3\n"
                           "add Coupler 54 OW0\n"
                           "add Coupler 55 OD2\n"
                           "start\n"
                           "sleep 300\n"
                           "write Coupler 54 -321\n"
                           "write Coupler 55 1\n"
                           "sleep 300\n"
                           "quit\n");
    EXPECT_TRUE(contains(lines, "ValueChange  51 = 4242, 52 = 1, 54 = 0, 55 = 0")) << lines.size();
    EXPECT_TRUE(contains(lines, "ValueChange  54 = -321, 55 = 1"));
    EXPECT_TRUE(contains(lines, "quit: ok"));
    simCommand("ow 0", "output word 0 = -321");
    simCommand("od 2", "output bit 2 = 1");
}

TEST_F(WagoCommand, TheTraceShowsARefusedCouplerAndTheHostCarriesOn) {
    simCommand("refuse on", "refusing connections");
    std::string errors;
    const auto lines = run({"--trace"},
                           "add Coupler 51 IW0\n"
                           "start\n"
                           "sleep 250\n"
                           "quit\n",
                           &errors);
    EXPECT_TRUE(contains(lines, "load: ok"));
    EXPECT_TRUE(contains(lines, "quit: ok"));
    EXPECT_FALSE(contains(lines, "ValueChange"));
    EXPECT_NE(errors.find("trace Coupler: MBTConnect(127.0.0.1, 502) failed: status 261, Could not "
                          "connect to the coupler (Connection refused)"),
              std::string::npos)
        << errors;
    EXPECT_NE(errors.find("trace Coupler: reconnecting to the coupler at 127.0.0.1"),
              std::string::npos);
}

}  // namespace
}  // namespace maroset::test
