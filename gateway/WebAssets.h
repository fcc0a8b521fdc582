#pragma once

#include <span>
#include <string_view>

namespace maroset::gateway {

// The page's files, built into the binary from gateway/web/ (see WebAssets.cmake): each with
// the path it is served at ("/" for index.html, "/app.js"), its content type and its bytes.
// Nothing is read from the file system at run time.
class WebAssets {
  public:
    struct File {
        std::string_view path;
        std::string_view contentType;
        std::string_view bytes;
    };

    static std::span<const File> Files();
    // The file served at path; null when there is none.
    static const File* Find(std::string_view path);
};

}  // namespace maroset::gateway
