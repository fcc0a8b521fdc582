#include "platform/tcp/TcpClient.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "SoftPlcProject.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "platform/tcp/SocketListener.h"
#include "sim/softplc/SoftPlcSimulator.h"
#include "support/HostRecorder.h"
#include "support/TempDir.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;

// Real sockets on 127.0.0.1 and the real loop, in real time (each wait is bounded).
class SoftPlcLoopback : public ::testing::Test {
  protected:
    platform::EventLoop& loop() { return scope_->loop(); }
    bool runUntil(const std::function<bool()>& done, std::chrono::milliseconds limit = 3000ms) {
        const auto deadline = loop().now() + limit;
        while (!done() && loop().now() < deadline) loop().runFor(5ms);
        return done();
    }

    test::TempDir drive_;
    ScopedRuntime scope_{std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                                   std::make_unique<platform::SystemClock>(),
                                                   drive_.path())};
};

TEST_F(SoftPlcLoopback, TheSocketControlConnectsTalksAndSeesThePeerClose) {
    std::shared_ptr<platform::TcpStream> accepted;
    std::string atServer;
    platform::SocketListener listener(loop(), "127.0.0.1", 0, [&](auto stream) {
        accepted = stream;
        accepted->listen({{}, {}, [&](std::string_view b) { atServer += b; }, {}, {}});
    });
    platform::TcpClient client(scope_->tcp());
    std::vector<std::string> events;
    auto c = client.Connected.subscribe([&] { events.push_back("connect"); });
    auto d = client.DataArrival.subscribe(
        [&](int32_t total) { events.push_back("data " + std::to_string(total)); });
    auto x = client.Closed.subscribe([&] { events.push_back("close"); });
    client.RemoteHost("localhost");  // a name: looked up off the loop first
    client.RemotePort(listener.port());
    client.Connect();
    EXPECT_EQ(client.State(), platform::TcpClient::sckResolvingHost);
    ASSERT_TRUE(runUntil([&] { return client.State() == platform::TcpClient::sckConnected; }));
    EXPECT_EQ(client.RemoteHostIP().rfind("127.0.0.1", 0) == 0 || client.RemoteHostIP() == "::1",
              true);
    client.SendData("<%TSL001;~ ;~003242%>");
    ASSERT_TRUE(runUntil([&] { return accepted && atServer.size() == 21; }));
    accepted->write("hello");
    ASSERT_TRUE(runUntil([&] { return client.BytesReceived() == 5; }));
    EXPECT_EQ(client.GetData(), "hello");
    accepted->close();
    ASSERT_TRUE(runUntil([&] { return client.State() == platform::TcpClient::sckClosing; }));
    EXPECT_EQ(events, (std::vector<std::string>{"connect", "data 5", "close"}));
    client.Close();
    EXPECT_EQ(client.State(), platform::TcpClient::sckClosed);
}

TEST_F(SoftPlcLoopback, APortNobodyListensOnIsRefusedWith10061) {
    int32_t port = 0;
    {
        platform::SocketListener probe(loop(), "127.0.0.1", 0, {});
        port = probe.port();
    }
    platform::TcpClient client(scope_->tcp());
    std::vector<std::string> errors;
    auto e = client.Error.subscribe(
        [&](int16_t n, const std::string& d) { errors.push_back(std::to_string(n) + " " + d); });
    client.RemoteHost("127.0.0.1");
    client.RemotePort(port);
    client.Connect();
    EXPECT_EQ(client.State(), platform::TcpClient::sckConnecting);
    ASSERT_TRUE(runUntil([&] { return !errors.empty(); }));
    EXPECT_EQ(errors, std::vector<std::string>{"10061 Connection is forcefully rejected"});
    EXPECT_EQ(client.State(), platform::TcpClient::sckError);
}

TEST_F(SoftPlcLoopback, TheDriverFollowsTheSimulatorAcrossARestart) {
    auto sim = sim::SoftPlcSimulator::OnLoopback(0, {100, 20});
    test::HostRecorder host;
    nodeDB& db = *host.host.nodeDB();
    db.AddAllNodes(test::SoftPlcProject(
        drive_.path() / "project.db",
        "('PLC1', 'NUVTCPIP', 1000, '127.0.0.1', " + std::to_string(sim->port()) + ")"));
    auto plc = db.getNode("PLC1");
    ASSERT_TRUE(runUntil([&] { return sim->clients() == 1; }));
    plc->AddTag(41, "Level");
    db.StartScanning();
    ASSERT_TRUE(runUntil([&] { return host.changes.size() >= 3; })) << "values move";
    plc->WriteTag("41", Variant("hello"));
    ASSERT_TRUE(runUntil([&] {
        return !host.changes.empty() && host.changes.back().values[0] == Variant("hello");
    }));

    sim->splitNext(1);  // cut in two on the wire, NAKed, resent whole
    sim->setValue(41, "split");
    ASSERT_TRUE(runUntil([&] { return host.changes.back().values[0] == Variant("split"); }));

    sim->stopListening();
    sim->startListening();
    auto& socket = static_cast<ClsDriverNUVSoftPLC&>(*plc->driver()).client()->Winsock;
    ASSERT_TRUE(runUntil([&] { return socket.State() == platform::TcpClient::sckClosing; }));
    db.StartScanning();  // the next activation reconnects and subscribes again
    ASSERT_TRUE(runUntil([&] { return sim->subscribed() == std::vector<int32_t>{41}; }));
    db.RemoveAllNodes();
    plc.reset();
    ASSERT_TRUE(runUntil([&] { return sim->clients() == 0; }));
}

}  // namespace
}  // namespace maroset
