#pragma once

#include <string>

#include "gateway/EventStream.h"
#include "gateway/HttpRequest.h"
#include "gateway/HttpResponse.h"
#include "gateway/TagBook.h"

namespace maroset {
class LinkStatusBoard;
class nodeDB;
}  // namespace maroset

namespace maroset::gateway {

class MqttPublisher;

// The service's HTTP API, as one function of a whole request, so it is tested and fuzzed
// without a socket:
//
//     GET  /api/nodes               every node's link status (LinkStatusJson)
//     GET  /api/tags                the tag table with the last value of each tag
//     POST /api/tags/NODE/HANDLE    {"value": V}: WriteTag (an array: WriteArray, zero-based)
//     GET  /api/events              the event stream (EventStream)
//     GET  /metrics                 Prometheus text (PrometheusText)
//     GET  /, /FILE                 the page (WebAssets)
//
// A write answers {"ok":true} or, when the library refuses it, {"ok":false,"error":{"number",
// "description"}}. Whatever the API itself refuses is an HttpResponse::Error: 400 malformed
// JSON or no "value", 401 a missing or wrong token, 403 writes not allowed, 404 no such node,
// tag or path, 405 a method the path does not take.
class ServeApi {
  public:
    struct WritePolicy {
        bool allowed = false;
        std::string token;  // empty: none needed
    };

    ServeApi(nodeDB& db, LinkStatusBoard& links, TagBook& tags, EventStream& events,
             WritePolicy writes);

    HttpResponse handle(const HttpRequest& request);
    // Adds the MQTT side to the node list (a `$mqtt` entry) and to the metrics.
    void attach(const MqttPublisher& mqtt) { mqtt_ = &mqtt; }

  private:
    HttpResponse nodes() const;
    // What the page needs to offer writes: {"writes": allowed, "token": a token is needed}.
    HttpResponse info() const;
    HttpResponse tags() const;
    HttpResponse write(const HttpRequest& request, std::string_view target);

    nodeDB& db_;
    LinkStatusBoard& links_;
    TagBook& tags_;
    EventStream& events_;
    WritePolicy writes_;
    const MqttPublisher* mqtt_ = nullptr;
};

}  // namespace maroset::gateway
