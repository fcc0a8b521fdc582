#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <string>
#include <vector>

#include "GatewayFixture.h"
#include "mqtt/sparkplug_b.pb.h"
#include "support/SqlScript.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;

// `maroset serve` as a child process, stopped with SIGTERM when the test is done.
class ServeProcess {
  public:
    explicit ServeProcess(const std::vector<std::string>& args) {
        pid_ = fork();
        if (pid_ == 0) {
            std::vector<char*> argv{const_cast<char*>(MAROSET_CLI_PATH), const_cast<char*>("serve")};
            for (const std::string& a : args) argv.push_back(const_cast<char*>(a.c_str()));
            argv.push_back(nullptr);
            freopen("/dev/null", "w", stdout);
            execv(MAROSET_CLI_PATH, argv.data());
            _exit(127);
        }
    }
    ~ServeProcess() {
        kill(pid_, SIGTERM);
        waitpid(pid_, nullptr, 0);
    }
    ServeProcess(const ServeProcess&) = delete;
    ServeProcess& operator=(const ServeProcess&) = delete;

  private:
    pid_t pid_;
};

// One broker, three gateways each with its own project, one host that sees them all.
class ScaleOut : public test::GatewayFixture {
  protected:
    // A project with one memory node "Tank" whose tag 1 is named Level.
    std::string project(int line) {
        const auto file = dir_.path() / ("line" + std::to_string(line) + ".db");
        test::RunSqlScript(file,
                           "create table Nodes (Name text, Driver text, OPCServer text, "
                           "OPCTopic text, UpdateRate integer, CommPort integer, BaudRate integer, "
                           "TagPrefex text, IPAddress text, Port integer);"
                           "insert into Nodes (Name, Driver, UpdateRate) values ('Tank', 'MEMTAG', 500);"
                           "create table Tags (Node text, Handle integer, Address text, Name text);"
                           "insert into Tags values ('Tank', 1, 'Level', 'Level');");
        return file.string();
    }
};

TEST_F(ScaleOut, OneHostSeesThreeEdgeNodesAndItsCommandReachesTheRightOne) {
    auto& host = probe("spBv1.0/Plant/#");
    std::vector<std::unique_ptr<ServeProcess>> gateways;
    for (int line = 1; line <= 3; ++line)
        gateways.push_back(std::make_unique<ServeProcess>(std::vector<std::string>{
            project(line), "--http", "127.0.0.1:0", "--mqtt", broker_.url(), "--sparkplug",
            "Plant/Line" + std::to_string(line), "--allow-writes",
            "--drive-root", dir_.path().string()}));
    const auto births = [&](const std::string& topic) { return host.on(topic).size(); };
    ASSERT_TRUE(runUntil([&] {
        for (int line = 1; line <= 3; ++line) {
            const std::string edge = "Line" + std::to_string(line);
            if (births("spBv1.0/Plant/NBIRTH/" + edge) != 1 ||
                births("spBv1.0/Plant/DBIRTH/" + edge + "/Tank") != 1)
                return false;
        }
        return true;
    }, 30s));

    sparkplug::Payload cmd;
    auto& m = *cmd.add_metrics();
    m.set_name("Level");
    m.set_datatype(sparkplug::String);  // as its birth declared it, having no value yet
    m.set_string_value("full");
    host.publish("spBv1.0/Plant/DCMD/Line2/Tank", cmd.SerializeAsString());
    ASSERT_TRUE(runUntil([&] { return births("spBv1.0/Plant/DDATA/Line2/Tank") == 1; }));
    sparkplug::Payload data;
    ASSERT_TRUE(data.ParseFromString(host.on("spBv1.0/Plant/DDATA/Line2/Tank")[0].payload));
    ASSERT_EQ(data.metrics_size(), 1);
    EXPECT_EQ(data.metrics(0).string_value(), "full");
    settle(500ms);
    EXPECT_EQ(births("spBv1.0/Plant/DDATA/Line1/Tank"), 0u);
    EXPECT_EQ(births("spBv1.0/Plant/DDATA/Line3/Tank"), 0u);
}

}  // namespace
}  // namespace maroset
