#include "gateway/HttpServer.h"

#include <arpa/inet.h>
#include <microhttpd.h>
#include <netinet/in.h>

#include <cstring>
#include <stdexcept>
#include <utility>

namespace maroset::gateway {

// What a request has sent so far.
struct HttpServer::Request {
    std::string body;
    bool refused = false;  // answered before its body was read
};

// An open event stream: the client's bytes and the connection that carries them.
struct HttpServer::Stream {
    HttpServer* server;
    MHD_Connection* connection;
    std::shared_ptr<EventStream::Client> client;
    bool suspended = false;

    void resume() {
        if (!suspended) return;
        suspended = false;
        MHD_resume_connection(connection);
        server->kick();
    }
};

struct Callbacks {
    static MHD_Result Access(void* self, MHD_Connection* connection, const char* url,
                             const char* method, const char*, const char* data, size_t* size,
                             void** state) {
        auto& server = *static_cast<HttpServer*>(self);
        auto* request = static_cast<HttpServer::Request*>(*state);
        auto refuse = [&] {
            request->refused = true;
            request->body.clear();
            return server.respond(connection,
                                  HttpResponse::Error(413, "request body over 65536 bytes"))
                       ? MHD_YES
                       : MHD_NO;
        };
        if (!request) {
            request = new HttpServer::Request;
            *state = request;
            // A body announced too large is refused before a byte of it is read.
            const char* length = MHD_lookup_connection_value(connection, MHD_HEADER_KIND,
                                                             MHD_HTTP_HEADER_CONTENT_LENGTH);
            if (length && std::strtoull(length, nullptr, 10) > HttpServer::MaxBody) return refuse();
            return MHD_YES;
        }
        if (*size > 0) {
            const size_t n = std::exchange(*size, 0);
            if (request->refused) return MHD_YES;
            if (request->body.size() + n > HttpServer::MaxBody) return refuse();
            request->body.append(data, n);
            return MHD_YES;
        }
        if (request->refused) return MHD_YES;
        const HttpResponse response =
            server.handle(connection, url, method, std::move(request->body));
        return server.respond(connection, response) ? MHD_YES : MHD_NO;
    }

    static void Completed(void*, MHD_Connection*, void** state, MHD_RequestTerminationCode) {
        delete static_cast<HttpServer::Request*>(*state);
        *state = nullptr;
    }

    static ssize_t ReadStream(void* cls, uint64_t, char* out, size_t max) {
        auto* stream = static_cast<HttpServer::Stream*>(cls);
        if (stream->client->dropped()) return MHD_CONTENT_READER_END_WITH_ERROR;
        const size_t n = stream->client->read(out, max);
        if (n > 0) return static_cast<ssize_t>(n);
        // Nothing to send: the connection waits, out of the daemon's way, until bytes arrive.
        stream->suspended = true;
        MHD_suspend_connection(stream->connection);
        return 0;
    }

    static void FreeStream(void* cls) {
        auto* stream = static_cast<HttpServer::Stream*>(cls);
        stream->client->ready = nullptr;
        stream->server->streams_.erase(stream);
        delete stream;
    }
};

HttpServer::HttpServer(platform::EventLoop& loop, const Settings& settings, Handler handler)
    : loop_(loop), handler_(std::move(handler)), host_(settings.host) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(settings.port);
    if (inet_pton(AF_INET, settings.host.c_str(), &address.sin_addr) != 1)
        throw std::runtime_error("not an IPv4 address: " + settings.host);

    daemon_ = MHD_start_daemon(
        MHD_USE_EPOLL | MHD_ALLOW_SUSPEND_RESUME, 0, nullptr, nullptr, &Callbacks::Access, this,
        MHD_OPTION_SOCK_ADDR, &address, MHD_OPTION_CONNECTION_LIMIT,
        static_cast<unsigned>(settings.maxConnections), MHD_OPTION_CONNECTION_TIMEOUT,
        static_cast<unsigned>(settings.idleSeconds), MHD_OPTION_CONNECTION_MEMORY_LIMIT,
        static_cast<size_t>(32 * 1024), MHD_OPTION_NOTIFY_COMPLETED, &Callbacks::Completed, this,
        MHD_OPTION_END);
    if (!daemon_)
        throw std::runtime_error("cannot listen on " + settings.host + ":" +
                                 std::to_string(settings.port));
    port_ = MHD_get_daemon_info(daemon_, MHD_DAEMON_INFO_BIND_PORT)->port;
    const int epollFd = MHD_get_daemon_info(daemon_, MHD_DAEMON_INFO_EPOLL_FD)->epoll_fd;
    watch_ = loop_.watch(epollFd, platform::EventLoop::Readable, [this](short) { run(); });
}

HttpServer::~HttpServer() {
    *alive_ = false;
    if (watch_) loop_.unwatch(*watch_);
    if (timer_) loop_.cancel(*timer_);
    // A suspended connection must be resumed before the daemon stops; its stream then ends.
    for (Stream* s : streams_) {
        s->client->ready = nullptr;
        if (s->suspended) {
            s->suspended = false;
            MHD_resume_connection(s->connection);
        }
    }
    MHD_stop_daemon(daemon_);
}

void HttpServer::run() {
    kicked_ = false;
    MHD_run(daemon_);
    if (timer_) loop_.cancel(*timer_);
    timer_.reset();
    MHD_UNSIGNED_LONG_LONG ms = 0;
    if (MHD_get_timeout(daemon_, &ms) == MHD_YES) {
        timer_ = loop_.schedule(platform::EventLoop::Duration(ms), [this] {
            timer_.reset();
            run();
        });
    }
}

void HttpServer::kick() {
    if (kicked_) return;
    kicked_ = true;
    loop_.post([this, alive = std::weak_ptr<bool>(alive_)] {
        if (alive.lock() && *alive.lock()) run();
    });
}

HttpResponse HttpServer::handle(MHD_Connection* connection, const char* url, const char* method,
                                std::string body) {
    HttpRequest r;
    r.method = method;
    r.path = url;
    if (const char* auth =
            MHD_lookup_connection_value(connection, MHD_HEADER_KIND, MHD_HTTP_HEADER_AUTHORIZATION))
        r.authorization = auth;
    r.body = std::move(body);
    try {
        return handler_(r);
    } catch (const std::exception&) {
        return HttpResponse::Error(500, "internal error");
    }
}

bool HttpServer::respond(MHD_Connection* connection, const HttpResponse& response) {
    MHD_Response* r;
    if (response.stream) {
        auto* stream = new Stream{this, connection, response.stream};
        streams_.insert(stream);
        response.stream->ready = [stream] { stream->resume(); };
        r = MHD_create_response_from_callback(MHD_SIZE_UNKNOWN, 4096, &Callbacks::ReadStream,
                                              stream, &Callbacks::FreeStream);
        MHD_add_response_header(r, MHD_HTTP_HEADER_CACHE_CONTROL, "no-cache");
    } else {
        r = MHD_create_response_from_buffer(
            response.body.size(), const_cast<char*>(response.body.data()), MHD_RESPMEM_MUST_COPY);
        MHD_add_response_header(r, MHD_HTTP_HEADER_CACHE_CONTROL, "no-store");
    }
    if (!r) return false;
    MHD_add_response_header(r, MHD_HTTP_HEADER_CONTENT_TYPE, response.contentType.c_str());
    MHD_add_response_header(r, "X-Content-Type-Options", "nosniff");
    const MHD_Result queued =
        MHD_queue_response(connection, static_cast<unsigned>(response.status), r);
    MHD_destroy_response(r);
    return queued == MHD_YES;
}

}  // namespace maroset::gateway
