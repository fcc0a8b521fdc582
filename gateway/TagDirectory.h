#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "gateway/TagTable.h"
#include "lang/Variant.h"
#include "platform/Clock.h"

namespace maroset::gateway {

// One tag the service publishes: where it lives (node and the host's handle), its address
// and the name people and brokers know it by, and the latest value a driver reported.
struct TagEntry {
    std::string node;  // the node's Name as the project spells it
    int32_t handle = 0;
    std::string address;
    std::string name;
    uint64_t position = 0;  // 1-based, in the order added; never reused
    Variant value;  // Empty until the first report
    platform::DateTime time{};
};

// The tags of a running project, found by node and handle (what drivers report) or by node
// and name (what a broker's write names). Node names match in any letter case, as the node
// collection's keys do; tag names match exactly. Entries never move once added, so a
// pointer to one stays valid for the directory's life.
class TagDirectory {
  public:
    // One node's tags.
    struct NodeTags {
        std::vector<TagEntry*> inOrder;
        std::unordered_map<int32_t, TagEntry*> byHandle;
        std::map<std::string, TagEntry*, std::less<>> byName;

        TagEntry* find(int32_t handle) const {
            const auto it = byHandle.find(handle);
            return it == byHandle.end() ? nullptr : it->second;
        }
    };

    TagDirectory() = default;
    // The service's tags as its Tags table names them.
    explicit TagDirectory(const std::vector<TagTable::Row>& rows);
    TagDirectory(const TagDirectory&) = delete;
    TagDirectory& operator=(const TagDirectory&) = delete;

    // Adds a tag; a second tag with the same node and handle is ignored.
    void add(std::string node, int32_t handle, std::string address, std::string name);

    // The node's tags (a report's handles are looked up here, the node once per report);
    // null when the node has none.
    const NodeTags* node(std::string_view node) const;
    TagEntry* find(std::string_view node, int32_t handle) const;
    TagEntry* byName(std::string_view node, std::string_view name) const;
    // Every tag in the order added.
    std::deque<TagEntry>& all() { return entries_; }

  private:
    std::deque<TagEntry> entries_;
    // Keyed by upper-cased node name.
    std::map<std::string, NodeTags, std::less<>> nodes_;
};

}  // namespace maroset::gateway
