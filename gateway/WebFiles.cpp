#include "gateway/WebFiles.h"

namespace maroset::gateway {

const WebFiles::File* WebFiles::find(std::string_view path) {
    if (path == "/") path = "/index.html";
    for (const File& file : all())
        if (file.path == path) return &file;
    return nullptr;
}

}  // namespace maroset::gateway
