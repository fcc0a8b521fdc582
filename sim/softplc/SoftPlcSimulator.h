#pragma once

#include <cstdint>
#include <functional>
#include <list>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Timer.h"
#include "platform/tcp/SocketListener.h"
#include "platform/tcp/TcpStream.h"
#include "sim/Simulator.h"

namespace maroset::sim {

// A soft-PLC server: accepts clients over TCP (loopback) or in memory (plugged into the
// runtime's TcpNetwork), acknowledges their frames and answers a NAK to bad ones, keeps tag
// values by handle, honours "TSL" and "RSL" subscriptions, pushes "NTV" frames with the
// values of subscribed tags (the values move over time), applies "NTV" and "ATV" writes (a
// written value then holds) and pushes the written values back to every client subscribed
// to them. Its own frames are resent like the client's: on a NAK (the oldest, up to its
// third try) and after three silent ticks of 500 ms (up to three resends).
//
// Faults on demand, through the typed methods below and through command():
// drop the ACKs of the next frames, answer them with a NAK instead, split the next frames
// it sends across two writes, corrupt their CRC, close every connection, stop answering
// altogether, stop and start listening (a restart), flood the clients with frames.
class SoftPlcSimulator final : public Simulator {
  public:
    struct Options {
        // How often subscribed values move (0: they stay unless written or set).
        int32_t stepMs = 1000;
        // The gap between the two writes of a split frame; over TCP they would otherwise
        // often arrive as one.
        int32_t splitGapMs = 0;
        // One NTV frame per value instead of one frame per client with all its changes
        // (hosts then see every change as a report of its own).
        bool oneValuePerFrame = false;
    };
    // A value as the server holds it, text as it goes on the wire.
    struct Tag {
        std::string name;
        std::string value;
        bool moving = true;
    };

    // Listens on 127.0.0.1:port (0: a free port).
    static std::unique_ptr<SoftPlcSimulator> OnLoopback(int32_t port, Options options);
    static std::unique_ptr<SoftPlcSimulator> OnLoopback(int32_t port = 0);
    // Serves connections to host:port made through the current runtime's TcpNetwork.
    static std::unique_ptr<SoftPlcSimulator> InMemory(const std::string& host, int32_t port,
                                                      Options options);
    static std::unique_ptr<SoftPlcSimulator> InMemory(const std::string& host, int32_t port);
    ~SoftPlcSimulator() override;

    std::string endpoint() const override;
    std::string help() const override;
    std::string command(std::string_view line) override;

    int32_t port() const { return port_; }

    // Data.
    // Sets a tag's value and pushes it to the clients subscribed to it.
    void setValue(int32_t handle, const std::string& value);
    std::optional<Tag> tag(int32_t handle) const;
    // Moves every subscribed value one step now (what the step timer does).
    void step();
    size_t clients() const;
    // The handles the clients subscribe to, in the order of their lists (all clients).
    std::vector<int32_t> subscribed() const;
    // The good frames received, oldest first, as "TYPE data" (for tests and the operator).
    const std::vector<std::string>& received() const { return received_; }

    // Faults.
    void dropAcks(int32_t frames) { dropAcks_ = frames; }
    void nakNext(int32_t frames) { nakNext_ = frames; }
    void splitNext(int32_t frames) { splitNext_ = frames; }
    void corruptNext(int32_t frames) { corruptNext_ = frames; }
    void setSilent(bool silent) { silent_ = silent; }
    bool silent() const { return silent_; }
    void closeConnections();
    void stopListening();
    void startListening();
    bool listening() const { return listening_; }
    // Pushes `frames` NTV frames with every subscribed value to every client at once.
    void flood(int32_t frames);

  private:
    class Session;

    SoftPlcSimulator(Options options);
    void listenOnLoopback(int32_t port);
    void listenInMemory(const std::string& host, int32_t port);
    void accept(std::shared_ptr<platform::TcpStream> stream);
    void forget(Session* session);
    // Sends one frame through a session, applying the split and corrupt faults.
    void transmit(Session& session, std::string frame);
    void onFrame(Session& session, const std::string& type, const std::string& data);
    void applyWrites(Session& session, const std::string& type, const std::string& data);
    void pushToSubscribers(const std::vector<int32_t>& handles);
    // One client's share of the values of `handles` (all it subscribes when empty).
    void push(Session& session, const std::vector<int32_t>* handles);
    Tag& tagFor(int32_t handle, const std::string& name);

    Options options_;
    bool inMemory_ = false;
    std::string host_ = "127.0.0.1";
    int32_t port_ = 0;
    bool listening_ = false;
    std::unique_ptr<platform::SocketListener> listener_;
    std::list<std::shared_ptr<Session>> sessions_;
    std::map<int32_t, Tag> tags_;
    platform::Timer stepTimer_;
    Subscription stepTick_;
    std::vector<std::string> received_;
    int32_t dropAcks_ = 0;
    int32_t nakNext_ = 0;
    int32_t splitNext_ = 0;
    int32_t corruptNext_ = 0;
    bool silent_ = false;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::sim
