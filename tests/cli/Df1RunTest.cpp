#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <future>
#include <regex>
#include <string>
#include <thread>

#include "CliProcess.h"
#include "platform/PollEventLoop.h"
#include "sim/df1/Df1Simulator.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

// A simulated PLC on a pseudo-terminal, served by its own loop on its own thread while the
// test runs the command.
class PlcOnAThread {
  public:
    PlcOnAThread() {
        std::promise<std::string> path;
        auto ready = path.get_future();
        thread_ = std::thread([this, &path] {
            platform::PollEventLoop loop;
            auto plc = sim::Df1Simulator::OnPseudoTerminal(loop);
            plc->setWord("N7:3", 1234);
            path.set_value(plc->endpoint());
            while (!stop_) loop.runFor(std::chrono::milliseconds(20));
        });
        path_ = ready.get();
    }
    ~PlcOnAThread() {
        stop_ = true;
        thread_.join();
    }
    const std::string& path() const { return path_; }

  private:
    std::atomic<bool> stop_{false};
    std::thread thread_;
    std::string path_;
};

TEST(Df1Run, ANodeOnTheMappedPortReportsThePlcsWordsAndWritesBack) {
    TempDir dir;
    const auto project = dir.path() / "plant.db";
    RunSqlScript(project,
                 "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
                 "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, "
                 "IPAddress TEXT, Port INTEGER);"
                 "INSERT INTO Nodes (Name, Driver, UpdateRate, CommPort) "
                 "VALUES ('Line1', 'nuvabdf1', 200, 3);");
    PlcOnAThread plc;
    const auto r = RunCli({"run", project.string(), "--drive-root", (dir.path() / "c").string(),
                           "--com", "Line1:1=" + plc.path(), "--json", "--trace"},
                          "add Line1 7 N7:3\nstart\nsleep 500\nwrite Line1 7 -9\nsleep 500\n");
    const std::vector<std::string> expected = {
        "{\"reply\":\"load\",\"ok\":true}",
        "{\"reply\":\"add\",\"ok\":true}",
        "{\"reply\":\"start\",\"ok\":true}",
        "{\"event\":\"ValueChange\",\"count\":1,\"handles\":[7],\"values\":[1234]}",
        "{\"reply\":\"sleep\",\"ok\":true}",
        "{\"reply\":\"write\",\"ok\":true}",
        "{\"event\":\"ValueChange\",\"count\":1,\"handles\":[7],\"values\":[-9]}",
        "{\"reply\":\"sleep\",\"ok\":true}",
        "{\"reply\":\"quit\",\"ok\":true}"};
    EXPECT_EQ(r.lines, expected) << r.errors;
    // The trace shows the read of N7:3 on the line, and nothing of it reaches standard output.
    EXPECT_TRUE(std::regex_search(
        r.errors, std::regex("trace Line1: [0-9]{2}:[0-9]{2}:[0-9]{2}\\.[0-9]{3} "
                             "sent 10 02 01 00 0F 00 01 00 A2 02 07 89 03 00 10 03")))
        << r.errors;
}

}  // namespace
}  // namespace maroset::test
