#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <optional>
#include <string>

#include "support/ChildProcess.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

// End to end: `maroset run` with a node whose OPCServer is the endpoint of an independent
// OPC UA server (node-opcua, tests/opcua/server/server.js).

namespace maroset::test {
namespace {

using namespace std::chrono_literals;

const std::filesystem::path ServerDir =
    std::filesystem::path(MAROSET_SOURCE_DIR) / "tests/opcua/server";

bool haveNode() {
    return std::system("command -v node > /dev/null 2>&1") == 0;
}

// The node-opcua server, its commands on standard input.
class UaServer {
  public:
    explicit UaServer(int port = 0, int channelLifetimeMs = 0)
        : process_({"/bin/sh", "-c",
                    "cd '" + ServerDir.string() + "' && exec node server.js " +
                        std::to_string(port) + " " + std::to_string(channelLifetimeMs) +
                        " 2>/dev/null"}) {
        for (int i = 0; i < 100 && endpoint_.empty(); ++i) {
            const auto line = process_.readLine(1000ms);
            if (line && line->starts_with("ENDPOINT ")) endpoint_ = line->substr(9);
        }
        if (endpoint_.empty()) throw std::runtime_error("the OPC UA test server did not start");
    }
    ~UaServer() {
        process_.write("quit\n");
        (void)process_.wait(5000ms);
    }

    const std::string& endpoint() const { return endpoint_; }
    int port() const { return std::stoi(endpoint_.substr(endpoint_.rfind(':') + 1)); }
    // Sends a command and waits for its OK.
    void command(const std::string& text) {
        process_.write(text + "\n");
        for (int i = 0; i < 30; ++i) {
            const auto line = process_.readLine(1000ms);
            if (line && *line == "OK " + text) return;
        }
        throw std::runtime_error("the OPC UA test server did not do " + text);
    }

  private:
    ChildProcess process_;
    std::string endpoint_;
};

// `maroset run` on a project of one node "Ua" on `endpoint`, output and trace on one pipe.
class Host {
  public:
    Host(const TempDir& dir, const std::string& endpoint, int rate = 100,
         const std::string& prefix = "nsu=urn:maroset:test;s=")
        : project_(dir.path() / "plant.db") {
        RunSqlScript(project_,
                     "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
                     "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, "
                     "IPAddress TEXT, Port INTEGER);"
                     "INSERT INTO Nodes (Name, Driver, OPCServer, OPCTopic, UpdateRate, TagPrefex) "
                     "VALUES ('Ua', 'OPC', '" +
                         endpoint + "', 'Ua', " + std::to_string(rate) + ", '" + prefix + "');");
        process_.emplace(std::vector<std::string>{
            "/bin/sh", "-c",
            std::string("exec '") + MAROSET_CLI_PATH + "' run '" + project_.string() +
                "' --drive-root '" + (dir.path() / "c").string() + "' --trace 2>&1"});
    }
    ~Host() {
        process_->write("quit\n");
        (void)process_->wait(10000ms);
    }
    void send(const std::string& line) { process_->write(line + "\n"); }
    // Reads lines until one holds `text`; everything read is kept for the failure message.
    bool await(const std::string& text, std::chrono::milliseconds limit = 10000ms) {
        const auto deadline = std::chrono::steady_clock::now() + limit;
        while (std::chrono::steady_clock::now() < deadline) {
            const auto line = process_->readLine(200ms);
            if (!line) continue;
            seen_ += *line + "\n";
            if (line->find(text) != std::string::npos) return true;
        }
        return false;
    }
    const std::string& seen() const { return seen_; }

  private:
    std::filesystem::path project_;
    std::optional<ChildProcess> process_;
    std::string seen_;
};

std::string missingPeer() {
    if (!haveNode()) return "node is not installed: the OPC UA end-to-end tests need it";
    if (!std::filesystem::exists(ServerDir / "node_modules/node-opcua"))
        return "node-opcua is not installed (./run does npm ci in tests/opcua/server)";
    return {};
}

// Scenarios that leave the server as it was share one server: it takes seconds to start.
class OpcUaRun : public ::testing::Test {
  protected:
    static void SetUpTestSuite() {
        if (missingPeer().empty()) shared_ = new UaServer();
    }
    static void TearDownTestSuite() {
        delete shared_;
        shared_ = nullptr;
    }
    void SetUp() override {
        if (const auto why = missingPeer(); !why.empty()) GTEST_SKIP() << why;
    }
    static UaServer& server() { return *shared_; }
    TempDir dir_;

  private:
    static inline UaServer* shared_ = nullptr;
};

// Scenarios that stop, freeze or reconfigure the server start their own.
class OpcUaFaults : public ::testing::Test {
  protected:
    void SetUp() override {
        if (const auto why = missingPeer(); !why.empty()) GTEST_SKIP() << why;
    }
    TempDir dir_;
};

TEST_F(OpcUaRun, ValuesOfEveryTypeArriveAndWritesConvertToTheVariablesType) {
    Host host(dir_, server().endpoint());
    const char* names[] = {"Boolean",       "SByte",    "Byte",       "Int16",   "UInt16", "Int32",
                           "UInt32",        "Int64",    "UInt64",     "Float",   "Double", "String",
                           "LocalizedText", "DateTime", "Int32Array", "ReadOnly"};
    int handle = 1;
    for (const char* n : names) host.send("add Ua " + std::to_string(handle++) + " " + n);
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    const std::string all = host.seen();
    for (const char* expected :
         {"1 = True", "2 = -5", "3 = 200", "4 = -1234", "5 = 60000", "6 = -100000",
          "7 = 4000000000", "8 = 4294967298", "9 = 7", "10 = 1.5", "11 = 3.25", "12 = \"Grüße\"",
          "13 = \"Hello\"", "14 = 1/2/2024 3:04:05 AM", "15 = (1, 2, 3, 4)", "16 = 42"})
        EXPECT_NE(all.find(expected), std::string::npos) << expected << "\n" << all;

    // A read asks the server: the value comes back though it did not change.
    const size_t before = host.seen().size();
    host.send("read Ua 6");
    ASSERT_TRUE(host.await("6 = -100000")) << host.seen();
    EXPECT_NE(host.seen().find("6 = -100000", before), std::string::npos);

    // Text that reads as a number goes to an Int16 as that number.
    host.send("write Ua 4 \"321\"");
    EXPECT_TRUE(host.await("4 = 321")) << host.seen();
    host.send("write Ua 14 \"1/1/2020\"");
    EXPECT_TRUE(host.await("14 = 1/1/2020")) << host.seen();
    // Out of a Byte's range, not a number for a Double, and a read-only variable.
    host.send("write Ua 3 300");
    EXPECT_TRUE(host.await("(BadOutOfRange)")) << host.seen();
    host.send("write Ua 11 \"abc\"");
    EXPECT_TRUE(host.await("(BadTypeMismatch)")) << host.seen();
    host.send("write Ua 16 1");
    EXPECT_TRUE(host.await("0xC0040006")) << host.seen();
}

TEST_F(OpcUaRun, UnknownAndMalformedItemsAreRefusedWithTheirOwnCodes) {
    {
        Host host(dir_, server().endpoint());
        host.send("add Ua 1 NoSuchVariable");
        EXPECT_TRUE(host.await("(BadNodeIdUnknown)")) << host.seen();
        EXPECT_TRUE(host.await("0xC0040007")) << host.seen();
    }
    {
        // A namespace the server does not have is an unknown item too.
        TempDir dir;
        Host host(dir, server().endpoint(), 100, "nsu=urn:nobody;s=");
        host.send("add Ua 1 Int32");
        EXPECT_TRUE(host.await("no namespace urn:nobody")) << host.seen();
        EXPECT_TRUE(host.await("0xC0040007")) << host.seen();
    }
    {
        // Not a node id at all: refused before anything is asked.
        TempDir dir;
        Host host(dir, server().endpoint(), 100, "ns=x;s=");
        host.send("add Ua 1 Int32");
        EXPECT_TRUE(host.await("0xC0040008")) << host.seen();
    }
}

TEST_F(OpcUaRun, ALargeArraySpanningChunksArrivesWhole) {
    Host host(dir_, server().endpoint(), 500);
    host.send("add Ua 1 LargeArray");
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    EXPECT_NE(host.seen().find("19998, 19999)"), std::string::npos);
}

TEST_F(OpcUaRun, StopAndStartTurnTheUpdatesOffAndOn) {
    Host host(dir_, server().endpoint());
    host.send("add Ua 1 Counter");
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    host.send("stop");
    ASSERT_TRUE(host.await("stop: ok")) << host.seen();
    host.send("sleep 500");
    ASSERT_TRUE(host.await("sleep: ok")) << host.seen();
    host.send("sleep 600");
    ASSERT_TRUE(host.await("sleep: ok")) << host.seen();
    const size_t quiet = host.seen().size();
    EXPECT_EQ(host.seen().find("ValueChange", quiet), std::string::npos);
    host.send("start");
    EXPECT_TRUE(host.await("ValueChange")) << host.seen();
}

TEST_F(OpcUaFaults, AServerRestartedWhileScanningIsFoundAgainWithoutHostAction) {
    UaServer server;
    Host host(dir_, server.endpoint());
    host.send("add Ua 1 Counter");
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    server.command("stop");
    ASSERT_TRUE(host.await(server.endpoint())) << host.seen();
    server.command("start");
    ASSERT_TRUE(host.await("session is back", 15000ms)) << host.seen();
    EXPECT_TRUE(host.await("ValueChange")) << host.seen();
}

TEST_F(OpcUaFaults, AServerAbsentAtLoadIsUsedOnceItStarts) {
    int port;
    {
        UaServer probe;
        port = probe.port();
    }
    TempDir dir;
    Host host(dir, "opc.tcp://127.0.0.1:" + std::to_string(port));
    host.send("add Ua 1 Counter");
    ASSERT_TRUE(host.await("add: ok")) << host.seen();
    host.send("start");
    UaServer server(port);
    ASSERT_TRUE(host.await("ValueChange", 20000ms)) << host.seen();
}

TEST_F(OpcUaFaults, AServerThatStopsAnsweringIsGivenUpAndFoundAgain) {
    UaServer server;
    Host host(dir_, server.endpoint());
    host.send("add Ua 1 Counter");
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    server.command("silent 12000");
    EXPECT_TRUE(host.await("stopped answering", 15000ms)) << host.seen();
    EXPECT_TRUE(host.await("session is back", 40000ms)) << host.seen();
    EXPECT_TRUE(host.await("ValueChange")) << host.seen();
}

TEST_F(OpcUaFaults, AServerThatAcceptsButNeverAnswersHoldsTheLoadFiveSecondsAtMost) {
    UaServer server;
    server.command("silent 9000");
    const auto began = std::chrono::steady_clock::now();
    Host host(dir_, server.endpoint());
    ASSERT_TRUE(host.await("load: ok", 8000ms)) << host.seen();
    EXPECT_LT(std::chrono::steady_clock::now() - began, 7s);
    EXPECT_TRUE(host.await("no session within 5 s")) << host.seen();
    // Items are accepted meanwhile and checked once the server answers.
    host.send("add Ua 1 Counter");
    host.send("start");
    EXPECT_TRUE(host.await("ValueChange", 30000ms)) << host.seen();
}

TEST_F(OpcUaFaults, AShortChannelLifetimeIsRenewedWithoutLosingTheSession) {
    UaServer server(0, 2000);
    Host host(dir_, server.endpoint());
    host.send("add Ua 1 Counter");
    host.send("start");
    ASSERT_TRUE(host.await("ValueChange")) << host.seen();
    const size_t scanning = host.seen().size();  // the connect lines name the server
    host.send("sleep 7000");
    ASSERT_TRUE(host.await("sleep: ok", 10000ms)) << host.seen();
    // Three renewals went by: no incident, and the values kept coming.
    EXPECT_EQ(host.seen().find(server.endpoint(), scanning), std::string::npos) << host.seen();
    const size_t at = host.seen().rfind("ValueChange");
    EXPECT_GT(at, host.seen().size() / 2);
}

}  // namespace
}  // namespace maroset::test
