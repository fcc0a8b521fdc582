#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "gateway/EventStream.h"

namespace maroset::gateway {

// What the API answers: a status with a whole body, or (stream set) an event stream that
// stays open for as long as the client listens.
struct HttpResponse {
    int status = 200;
    std::string contentType = "application/json";
    std::string body;
    std::shared_ptr<EventStream::Client> stream;

    static HttpResponse Json(std::string body, int status = 200) {
        return HttpResponse{status, "application/json", std::move(body), nullptr};
    }
    // {"ok":false,"error":{"status":404,"message":"..."}}: every refusal of the API.
    static HttpResponse Error(int status, std::string_view message);
};

}  // namespace maroset::gateway
