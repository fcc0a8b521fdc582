#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "gateway/EventStream.h"
#include "gateway/HttpServer.h"
#include "gateway/ServeApi.h"
#include "gateway/TagBook.h"
#include "gateway/TagTable.h"

namespace maroset {
class nodeDB;
}

namespace maroset::gateway {

// A running project served over HTTP: the tag book, the event stream, the API and the server
// on the current runtime's loop, for as long as it lives. `maroset serve` and `maroset demo
// --http` each make one after their tags are registered.
//
// Writes reach real machines, so they are refused unless allowed, and a listen address other
// than loopback without a token refuses them whatever was asked: anyone who can reach the port
// could otherwise write.
class WebService {
  public:
    struct Settings {
        std::string host = "127.0.0.1";
        uint16_t port = 8080;
        bool allowWrites = false;
        std::string token;  // empty: none
    };

    // Listens at once (std::runtime_error when it cannot).
    WebService(nodeDB& db, std::vector<TagTable::Row> tags, const Settings& settings);

    // "http://HOST:PORT/"
    std::string url() const;
    uint16_t port() const { return server_.port(); }
    bool writesAllowed() const { return writes_.allowed; }

    // Whether host is an IPv4 loopback address (127.0.0.0/8).
    static bool IsLoopback(const std::string& host);

  private:
    ServeApi::WritePolicy writes_;
    TagBook tags_;
    EventStream events_;
    ServeApi api_;
    HttpServer server_;
};

}  // namespace maroset::gateway
