#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "core/LinkStatusBoard.h"
#include "core/ReportTap.h"
#include "gateway/JsonWriter.h"
#include "lang/Subscription.h"
#include "platform/Clock.h"
#include "platform/EventLoop.h"

namespace maroset::gateway {

// The service's live events as Server-Sent Events, for every client that listens:
//
//     event: values   data: [{"node","handle","value","time"},...]   (one per loop turn)
//     event: error    data: {"driver","from","message"}
//     event: link     data: {"node","state"}
//
// Values are gathered while the loop turn lasts and sent as one event when it ends (a posted
// call), so a scan that reports a thousand tags costs one write per client, and nothing at all
// is built while no client listens. A comment line every KeepAlive keeps idle connections
// (and proxies) open and finds clients that went away.
//
// A client that does not read keeps at most MaxBacklog bytes here; beyond that it is dropped,
// so a slow client never grows memory nor holds back the others.
class EventStream {
  public:
    static constexpr size_t MaxBacklog = 1 << 20;
    static constexpr platform::EventLoop::Duration KeepAlive{15000};

    // One listening client: the bytes it has not read yet. The connection that carries it sets
    // `ready`, called when bytes arrive (or the client is dropped) after read() found none.
    class Client {
      public:
        // Copies up to max bytes out; 0 when there are none now.
        size_t read(char* out, size_t max);
        // Dropped for reading too slowly (or the service is closing): the connection ends.
        bool dropped() const { return dropped_; }
        std::function<void()> ready;

      private:
        friend class EventStream;
        void append(std::string_view bytes);
        void drop();

        std::string backlog_;
        size_t offset_ = 0;
        bool dropped_ = false;
    };

    EventStream(platform::EventLoop& loop, ReportTap& reports, LinkStatusBoard& links,
                const platform::Clock& clock);
    ~EventStream();
    EventStream(const EventStream&) = delete;
    EventStream& operator=(const EventStream&) = delete;

    // A new client; it listens for as long as the caller keeps it.
    std::shared_ptr<Client> connect();
    // Clients still listening.
    size_t clients();
    // Drops every client (the service is closing).
    void dropAll();

  private:
    void values(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                const VbArray<Variant>& values);
    void flushValues();
    void send(std::string_view bytes);
    void keepAlive();

    platform::EventLoop& loop_;
    const platform::Clock& clock_;
    std::vector<std::weak_ptr<Client>> clients_;
    std::optional<JsonWriter> batch_;  // the values of this loop turn, array open
    platform::DateTime stampTime_{};
    std::string stampJson_;  // stampTime_ as JSON
    std::string stampNode_;
    std::string nodeJson_;  // stampNode_ as JSON
    std::optional<platform::EventLoop::TimerId> keepAlive_;
    Subscription valuesTap_;
    Subscription errorsTap_;
    Subscription linkChanges_;
};

}  // namespace maroset::gateway
