#include "gateway/WebService.h"

#include <arpa/inet.h>

#include "core/Runtime.h"

namespace maroset::gateway {

namespace {

ServeApi::WritePolicy policy(const WebService::Settings& s) {
    const bool exposed = !WebService::IsLoopback(s.host) && s.token.empty();
    return {s.allowWrites && !exposed, s.token};
}

HttpServer::Settings listenAt(const WebService::Settings& s) {
    HttpServer::Settings settings;
    settings.host = s.host;
    settings.port = s.port;
    return settings;
}

}  // namespace

WebService::WebService(nodeDB& db, std::vector<TagTable::Row> tags, const Settings& settings)
    : writes_(policy(settings)),
      tags_(Runtime::current().reports(), Runtime::current().clock(), std::move(tags)),
      events_(Runtime::current().loop(), Runtime::current().reports(),
              Runtime::current().linkStatus(), Runtime::current().clock()),
      api_(db, Runtime::current().linkStatus(), tags_, events_, writes_),
      server_(Runtime::current().loop(), listenAt(settings),
              [this](const HttpRequest& r) { return api_.handle(r); }) {}

std::string WebService::url() const {
    return "http://" + server_.host() + ":" + std::to_string(server_.port()) + "/";
}

bool WebService::IsLoopback(const std::string& host) {
    in_addr address{};
    return inet_pton(AF_INET, host.c_str(), &address) == 1 && (ntohl(address.s_addr) >> 24) == 127;
}

}  // namespace maroset::gateway
