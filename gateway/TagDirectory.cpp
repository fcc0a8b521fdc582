#include "gateway/TagDirectory.h"

#include "lang/Strings.h"

namespace maroset::gateway {

TagDirectory::TagDirectory(const std::vector<TagTable::Row>& rows) {
    for (const TagTable::Row& row : rows) add(row.node, row.handle, row.address, row.name);
}

void TagDirectory::add(std::string node, int32_t handle, std::string address, std::string name) {
    std::string key = UCase(node);
    if (byHandle_.contains(std::pair(key, handle))) return;

    TagEntry& e = entries_.emplace_back();
    e.node = std::move(node);
    e.handle = handle;
    e.address = std::move(address);
    e.name = std::move(name);
    e.position = entries_.size();
    byHandle_[{key, handle}] = &e;
    byName_.try_emplace({std::move(key), e.name}, &e);
}

TagEntry* TagDirectory::find(std::string_view node, int32_t handle) {
    const auto it = byHandle_.find(std::pair(UCase(node), handle));
    return it == byHandle_.end() ? nullptr : it->second;
}

TagEntry* TagDirectory::byName(std::string_view node, std::string_view name) {
    const auto it = byName_.find(std::pair(UCase(node), std::string(name)));
    return it == byName_.end() ? nullptr : it->second;
}

std::vector<TagEntry*> TagDirectory::ofNode(std::string_view node) {
    std::vector<TagEntry*> out;
    const std::string key = UCase(node);
    for (TagEntry& e : entries_)
        if (UCase(e.node) == key) out.push_back(&e);
    return out;
}

}  // namespace maroset::gateway
