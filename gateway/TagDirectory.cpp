#include "gateway/TagDirectory.h"

#include "lang/Strings.h"

namespace maroset::gateway {

TagDirectory::TagDirectory(const std::vector<TagTable::Row>& rows) {
    for (const TagTable::Row& row : rows) add(row.node, row.handle, row.address, row.name);
}

void TagDirectory::add(std::string node, int32_t handle, std::string address, std::string name) {
    NodeTags& tags = nodes_[UCase(node)];
    if (tags.byHandle.contains(handle)) return;
    TagEntry& e = entries_.emplace_back();
    e.node = std::move(node);
    e.handle = handle;
    e.address = std::move(address);
    e.name = std::move(name);
    e.position = entries_.size();
    tags.inOrder.push_back(&e);
    tags.byHandle.emplace(handle, &e);
    tags.byName.try_emplace(e.name, &e);
}

const TagDirectory::NodeTags* TagDirectory::node(std::string_view node) const {
    const auto it = nodes_.find(UCase(node));
    return it == nodes_.end() ? nullptr : &it->second;
}

TagEntry* TagDirectory::find(std::string_view node, int32_t handle) const {
    const NodeTags* tags = this->node(node);
    return tags ? tags->find(handle) : nullptr;
}

TagEntry* TagDirectory::byName(std::string_view node, std::string_view name) const {
    const NodeTags* tags = this->node(node);
    if (!tags) return nullptr;
    const auto it = tags->byName.find(name);
    return it == tags->byName.end() ? nullptr : it->second;
}

}  // namespace maroset::gateway
