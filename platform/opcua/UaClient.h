#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/EventLoop.h"
#include "platform/opcua/UaChunks.h"
#include "platform/opcua/UaCodec.h"
#include "platform/tcp/TcpNetwork.h"
#include "platform/tcp/TcpStream.h"

namespace maroset::platform::opcua {

// An endpoint URL taken apart: "opc.tcp://HOST[:PORT][/PATH]", the scheme in any letter
// case, port 4840 when absent. False for anything else.
struct EndpointUrl {
    std::string host;
    int32_t port = 4840;
    static constexpr int32_t DefaultPort = 4840;
    static bool Parse(const std::string& url, EndpointUrl& out);
};

// One client session with one OPC UA server, on the loop and the TCP seam: UA TCP (HEL/ACK),
// a secure channel with security policy None renewed before its lifetime runs out, a session
// with the anonymous identity, service calls and the publish requests of its subscriptions.
//
// The session is one state machine:
//   Idle -> Connecting -> Hello -> Channel -> Session -> Active
// and from any state but Idle a failure (connection refused or lost, ERR, a service call or
// the server's keep-alive not answered in time, a channel or session refused) goes to
// Backoff, which tries again after 1 s, doubling up to 30 s, and back to 1 s once Active.
// stop() goes to Idle from anywhere.
//
// Callbacks run on the loop. A callback may call anything on the client, stop it or destroy
// it.
class UaClient {
  public:
    enum class State { Idle, Connecting, Hello, Channel, Session, Active, Backoff };
    static const char* StateName(State s);

    struct Options {
        std::string endpointUrl;
        std::chrono::milliseconds connectTimeout{5000};
        std::chrono::milliseconds callTimeout{2000};
        std::chrono::milliseconds channelLifetime{600000};
        std::chrono::milliseconds firstRetry{1000};
        std::chrono::milliseconds longestRetry{30000};
        // Nothing heard for this long while publish requests wait: the server is lost.
        std::chrono::milliseconds silence{8000};
        uint32_t publishRequests = 3;
    };

    // A service call's outcome: the service result (a ServiceFault's too) and the response's
    // values (empty on a fault, a time-out or a lost connection).
    using Done = std::function<void(uint32_t status, std::vector<Value>& response)>;
    // Fills a request's values after its header.
    using Fill = std::function<void(std::vector<Value>& request)>;

    struct Handlers {
        std::function<void(State)> stateChanged;
        // What went wrong, for the trace, with the UA status when there is one.
        std::function<void(const std::string& text, uint32_t status)> incident;
        // A data change of a monitored item: subscription, client handle, value. The value
        // may be moved from.
        std::function<void(uint32_t subscription, uint32_t handle, DataValue& value)> dataChange;
        // A subscription the server no longer has (BadNoSubscription, status change).
        std::function<void(uint32_t subscription, uint32_t status)> subscriptionLost;
    };

    UaClient(EventLoop& loop, TcpNetwork& network, Options options, Handlers handlers);
    ~UaClient();
    UaClient(const UaClient&) = delete;
    UaClient& operator=(const UaClient&) = delete;

    void start();
    void stop();
    State state() const { return state_; }
    const std::string& endpointUrl() const { return options_.endpointUrl; }
    // Failed attempts since the session was last active.
    uint32_t failures() const { return failures_; }
    // The server's namespace array, read when the session became active.
    const std::vector<std::string>& namespaces() const { return namespaces_; }

    // Sends a request of `request`'s type; `response` is the type expected back. Done is
    // called once, on the loop (BadNotConnected at once when the session is not active).
    void call(const StructType& request, const StructType& response, const Fill& fill, Done done);

    // Keeps publish requests outstanding while `on` and the session is active.
    void publishing(bool on);

    // Feeds received bytes as the stream would (for tests and the fuzzer).
    void received(std::string_view bytes);

  private:
    // A response's encoding id is its request's plus 3, for every service.
    static constexpr uint32_t ResponseOffset = 3;
    struct Pending {
        const StructType* response;
        uint32_t responseId;
        Done done;
        EventLoop::TimerId timer;
        bool publish;
    };

    void enter(State s);
    void connect();
    void fail(const std::string& text, uint32_t status);
    void closeStream();
    void onMessage(const UaMessage& m);
    void sendHello();
    void openChannel(bool renew);
    void onChannel(const UaMessage& m);
    void createSession();
    void activateSession(const std::string& policyId);
    void readNamespaces();
    void send(const StructType& request, const Fill& fill, uint32_t handle, uint32_t timeoutMs);
    // Sends a request in any state and waits callTimeout for its answer.
    void request(const StructType& type, const StructType& response, const Fill& fill, Done done);
    void respond(uint32_t handle, uint32_t status, std::vector<Value>& values);
    void failAll(uint32_t status);
    void topUpPublish();
    void onPublish(uint32_t status, std::vector<Value>& v);
    void armSilence();
    int64_t ticksNow() const;

    EventLoop& loop_;
    TcpNetwork& network_;
    Options options_;
    Handlers handlers_;
    EndpointUrl endpoint_;
    bool endpointValid_ = false;
    State state_ = State::Idle;
    std::shared_ptr<TcpStream> stream_;
    UaChunkAssembler assembler_;
    uint32_t sendChunkSize_ = 65536;
    uint32_t channelId_ = 0;
    uint32_t tokenId_ = 0;
    uint32_t sequence_ = 1;
    uint32_t nextRequestId_ = 1;
    uint32_t nextHandle_ = 1;
    NodeId authenticationToken_;
    std::map<uint32_t, Pending> pending_;          // by request handle (= request id)
    std::optional<EventLoop::TimerId> stepTimer_;  // connect/hello/channel/session deadline
    std::optional<EventLoop::TimerId> retryTimer_;
    std::optional<EventLoop::TimerId> renewTimer_;
    std::optional<EventLoop::TimerId> silenceTimer_;
    std::chrono::milliseconds retryDelay_;
    uint32_t failures_ = 0;
    bool publishing_ = false;
    uint32_t publishOut_ = 0;
    std::vector<std::pair<uint32_t, uint32_t>> acks_;  // subscription, sequence number
    std::vector<std::string> namespaces_;
    std::vector<Value> scratch_;  // request values, reused
    std::vector<Value> notes_;    // a notification's values, reused
    std::string out_;             // an encoded request, reused
    std::string body_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform::opcua
