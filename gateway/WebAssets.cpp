#include "gateway/WebAssets.h"

namespace maroset::gateway {

const WebAssets::File* WebAssets::Find(std::string_view path) {
    for (const File& f : Files()) {
        if (f.path == path) return &f;
    }
    return nullptr;
}

}  // namespace maroset::gateway
