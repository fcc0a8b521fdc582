#pragma once

#include <string>

namespace maroset::gateway {

// One HTTP request as the API sees it, whole: the server has already bounded its body.
struct HttpRequest {
    std::string method;         // "GET", "POST", ...
    std::string path;           // decoded, without the query
    std::string authorization;  // the Authorization header; empty when absent
    std::string body;
};

}  // namespace maroset::gateway
