#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <string>

#include "MosquittoBroker.h"
#include "MqttProbe.h"
#include "core/ScopedRuntime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "gateway/TagDirectory.h"
#include "gateway/mqtt/MqttPublisher.h"
#include "platform/PollEventLoop.h"
#include "platform/SystemClock.h"
#include "sim/softplc/SoftPlcSimulator.h"
#include "softplc/SoftPlcProject.h"
#include "support/TempDir.h"

namespace maroset::test {

// The service's MQTT side against a real mosquitto on loopback, on the real loop in real time;
// every wait is bounded. Probes are pumped with the loop.
class GatewayFixture : public ::testing::Test {
  protected:
    platform::EventLoop& loop() { return scope_->loop(); }
    Runtime& runtime() { return *scope_; }

    gateway::MqttOptions options() const {
        gateway::MqttOptions o;
        o.setUrl(broker_.url());
        return o;
    }
    gateway::MqttPublisher& startPublisher(gateway::MqttOptions o) {
        publisher_ = std::make_unique<gateway::MqttPublisher>(runtime(), tags_, std::move(o));
        publisher_->start();
        return *publisher_;
    }
    void SetUp() override { ASSERT_TRUE(broker_.start()) << "mosquitto did not start"; }

    // A consumer subscribed to `subscription`, connected before it is returned.
    MqttProbe& probe(const std::string& subscription, int port = 0) {
        probes_.push_back(std::make_unique<MqttProbe>(port ? port : broker_.port(), subscription));
        MqttProbe& p = *probes_.back();
        EXPECT_TRUE(runUntil([&] { return p.subscribed(); }));
        return p;
    }

    // A soft-PLC node "PLC1" on a loopback simulator, its tag 41 named TankLevel, scanning.
    std::shared_ptr<node> plc(sim::SoftPlcSimulator& sim) {
        nodeDB& db = *runtime().nodes();
        db.AddAllNodes(SoftPlcProject(dir_.path() / "project.db",
                                      "('PLC1', 'NUVTCPIP', 1000, '127.0.0.1', " +
                                          std::to_string(sim.port()) + ")"));
        tags_.add("PLC1", 41, "Level", "TankLevel");
        auto n = db.getNode("PLC1");
        n->AddTag(41, "Level");
        db.StartScanning();
        return n;
    }

    bool runUntil(const std::function<bool()>& done,
                  std::chrono::milliseconds limit = std::chrono::seconds(10)) {
        const auto deadline = loop().now() + limit;
        while (!done() && loop().now() < deadline) {
            loop().runFor(std::chrono::milliseconds(2));
            for (auto& p : probes_) p->pump();
        }
        return done();
    }
    // Runs a short while, for what must not happen.
    void settle(std::chrono::milliseconds d = std::chrono::milliseconds(300)) {
        runUntil([] { return false; }, d);
    }

    TempDir dir_;
    ScopedRuntime scope_{std::make_unique<Runtime>(std::make_unique<platform::PollEventLoop>(),
                                                   std::make_unique<platform::SystemClock>(),
                                                   dir_.path())};
    MosquittoBroker broker_{dir_.path()};
    gateway::TagDirectory tags_;
    std::vector<std::unique_ptr<MqttProbe>> probes_;
    std::unique_ptr<gateway::MqttPublisher> publisher_;
};

}  // namespace maroset::test
