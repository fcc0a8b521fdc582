#include "cli/ServeCommand.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <fstream>
#include <optional>
#include <regex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "CliProcess.h"
#include "platform/PollEventLoop.h"
#include "support/HttpClient.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

extern char** environ;

namespace maroset::test {
namespace {

using namespace std::chrono_literals;

std::string readFile(const std::filesystem::path& file) {
    std::ifstream in(file);
    std::stringstream text;
    text << in.rdbuf();
    return text.str();
}

// `maroset serve` running as its own process, its output in files.
class ServeProcess {
  public:
    ServeProcess(const TempDir& dir, std::vector<std::string> args) : dir_(dir) {
        args.insert(args.begin(), {MAROSET_CLI_PATH, "serve"});
        std::vector<char*> argv;
        for (auto& a : args) argv.push_back(a.data());
        argv.push_back(nullptr);
        posix_spawn_file_actions_t actions;
        posix_spawn_file_actions_init(&actions);
        posix_spawn_file_actions_addopen(&actions, 0, "/dev/null", O_RDONLY, 0);
        posix_spawn_file_actions_addopen(&actions, 1, out().c_str(), O_WRONLY | O_CREAT | O_TRUNC,
                                         0644);
        posix_spawn_file_actions_addopen(&actions, 2, err().c_str(), O_WRONLY | O_CREAT | O_TRUNC,
                                         0644);
        if (posix_spawn(&pid_, argv[0], &actions, nullptr, argv.data(), environ) != 0) pid_ = -1;
        posix_spawn_file_actions_destroy(&actions);
    }
    ~ServeProcess() {
        if (pid_ > 0 && !status_) {
            kill(pid_, SIGKILL);
            waitpid(pid_, nullptr, 0);
        }
    }

    std::filesystem::path out() const { return dir_.path() / "serve.out"; }
    std::filesystem::path err() const { return dir_.path() / "serve.err"; }

    // The first line of standard output, once it is complete (empty after 10 s without).
    std::string firstLine() {
        for (int i = 0; i < 1000; ++i) {
            const std::string text = readFile(out());
            if (const auto nl = text.find('\n'); nl != std::string::npos) return text.substr(0, nl);
            std::this_thread::sleep_for(10ms);
        }
        return {};
    }
    // Sends the signal and waits (10 s at most) for the exit status; -1 if it did not exit.
    int stop(int signal) {
        kill(pid_, signal);
        for (int i = 0; i < 1000; ++i) {
            int status = 0;
            if (waitpid(pid_, &status, WNOHANG) == pid_) {
                status_ = status;
                return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
            }
            std::this_thread::sleep_for(10ms);
        }
        return -1;
    }

  private:
    const TempDir& dir_;
    pid_t pid_ = -1;
    std::optional<int> status_;
};

class ServeCommandTest : public ::testing::Test {
  protected:
    ServeCommandTest() {
        RunSqlScript(project(),
                     "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
                     "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, "
                     "IPAddress TEXT, Port INTEGER);"
                     "INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');"
                     "CREATE TABLE Tags (Node TEXT, Handle INTEGER, Address TEXT, Name TEXT);"
                     "INSERT INTO Tags VALUES ('Mem', 1, 'Setpoint', 'Set point'),"
                     " ('Pump', 2, 'Speed', NULL), ('Mem', 1, 'Again', NULL);");
    }
    std::filesystem::path project() const { return dir_.path() / "plant.db"; }
    std::vector<std::string> serveArgs(std::vector<std::string> extra) const {
        extra.insert(extra.begin(), {project().string(), "--drive-root",
                                     (dir_.path() / "drive_c").string(), "--http", "127.0.0.1:0"});
        return extra;
    }

    TempDir dir_;
};

TEST_F(ServeCommandTest, ServesTheProjectsTagsUntilASignalStopsItCleanly) {
    for (const int signal : {SIGTERM, SIGINT}) {
        ServeProcess serve(dir_, serveArgs({"--allow-writes"}));
        const std::string line = serve.firstLine();
        std::smatch m;
        ASSERT_TRUE(std::regex_match(
            line, m, std::regex(R"(maroset serve: listening on http://127\.0\.0\.1:(\d+)/)")))
            << line << readFile(serve.err());

        platform::PollEventLoop loop;
        HttpClient http(loop, static_cast<uint16_t>(std::stoi(m[1])));
        EXPECT_EQ(http.request("POST", "/api/tags/Mem/1", R"({"value":4})").body, R"({"ok":true})");
        const auto tags = http.request("GET", "/api/tags");
        EXPECT_EQ(
            tags.body.rfind(
                R"([{"node":"Mem","handle":1,"address":"Setpoint","name":"Set point","value":4,"type":"Long","time":")",
                0),
            0u)
            << tags.body;
        EXPECT_EQ(serve.stop(signal), 0);
        EXPECT_EQ(readFile(serve.err()),
                  "maroset serve: tag Pump 2 (Speed): no node named 'Pump' in the project\n"
                  "maroset serve: tag Mem 1 (Again): handle 1 is already used on Mem\n");
        EXPECT_EQ(readFile(serve.out()), line + "\n");
    }
}

TEST_F(ServeCommandTest, UsageAndMissingProjectsAreRefusedBeforeListening) {
    EXPECT_EQ(RunCli({"serve"}).status, 2);
    EXPECT_EQ(RunCli({"serve", project().string(), "--http", "localhost:80"}).status, 2);
    EXPECT_EQ(RunCli({"serve", project().string(), "--http", "127.0.0.1:65536"}).status, 2);
    EXPECT_EQ(RunCli({"serve", project().string(), "--token="}).status, 2);
    const auto missing = RunCli({"serve", (dir_.path() / "none.db").string()});
    EXPECT_EQ(missing.status, 1);
    EXPECT_NE(missing.errors.find("not found"), std::string::npos);
}

}  // namespace
}  // namespace maroset::test
