#pragma once

#include <span>
#include <string_view>

namespace maroset::gateway {

// The live page's files (gateway/web/), compiled into the program by
// cmake/EmbedFiles.cmake, so the service serves them with no file access at run time and
// no request path ever reaches the file system.
class WebFiles {
  public:
    struct File {
        std::string_view path;         // as requested: "/index.html"
        std::string_view contentType;  // for the Content-Type header
        std::string_view bytes;
    };

    // The file served at a request's path, "/" being the index page; nullptr for any other
    // path. The path is compared as is: a query string is the caller's to strip.
    static const File* find(std::string_view path);

    // Every file, sorted by path. Defined in the generated source.
    static std::span<const File> all();
};

}  // namespace maroset::gateway
