#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <set>
#include <string>

#include "gateway/HttpRequest.h"
#include "gateway/HttpResponse.h"
#include "platform/EventLoop.h"

struct MHD_Daemon;
struct MHD_Connection;

namespace maroset::gateway {

// An HTTP/1.1 server on the host's loop: libmicrohttpd in external mode, its one epoll
// descriptor watched by the loop and MHD_get_timeout bounding the next wake-up, so requests
// are served on the drivers' thread between their events, with no thread and no lock. While
// nothing happens it costs nothing: no timer runs unless a connection has a time-out pending.
//
// Every request reaches the handler whole. What a client could abuse is bounded here: the
// number of connections, the time a connection may stay idle, the memory per connection, the
// body (MaxBody; larger ones get 413 before they are read).
//
// An event stream response (HttpResponse::stream) stays open: the connection is suspended
// while the client has nothing to read and resumed when the stream has bytes for it.
class HttpServer {
  public:
    struct Settings {
        std::string host = "127.0.0.1";  // an IPv4 address to listen on
        uint16_t port = 8080;            // 0: any free port
        unsigned maxConnections = 64;
        unsigned idleSeconds = 30;
    };
    using Handler = std::function<HttpResponse(const HttpRequest&)>;

    static constexpr size_t MaxBody = 64 * 1024;

    // Listens at once; std::runtime_error when it cannot (a bad address, a port in use).
    HttpServer(platform::EventLoop& loop, const Settings& settings, Handler handler);
    ~HttpServer();
    HttpServer(const HttpServer&) = delete;
    HttpServer& operator=(const HttpServer&) = delete;

    const std::string& host() const { return host_; }
    // The port listened on (the one chosen when Settings::port was 0).
    uint16_t port() const { return port_; }

  private:
    struct Request;
    struct Stream;
    // libmicrohttpd's callbacks, in HttpServer.cpp.
    friend struct Callbacks;

    HttpResponse handle(MHD_Connection* connection, const char* url, const char* method,
                        std::string body);
    // Queues the response; false when libmicrohttpd refuses it (the connection then closes).
    bool respond(MHD_Connection* connection, const HttpResponse& response);
    // Lets libmicrohttpd do what is ready, then sets the timer for what it waits for.
    void run();
    // A run at the next turn (after a resume, which libmicrohttpd acts on in its next run).
    void kick();

    platform::EventLoop& loop_;
    Handler handler_;
    std::string host_;
    uint16_t port_ = 0;
    MHD_Daemon* daemon_ = nullptr;
    std::optional<platform::EventLoop::WatchId> watch_;
    std::optional<platform::EventLoop::TimerId> timer_;
    bool kicked_ = false;
    std::set<Stream*> streams_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::gateway
