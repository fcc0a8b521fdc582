#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "core/ReportTap.h"
#include "gateway/TagTable.h"
#include "lang/Subscription.h"
#include "lang/Variant.h"
#include "platform/Clock.h"

namespace maroset::gateway {

// The service's tags and what the drivers last reported for each: value, when it changed and
// how many times. Fed by the report tap, which tells which node a value came from (two nodes
// may use the same handle). Only observes; writes go through the node like any host's.
class TagBook {
  public:
    struct Tag {
        TagTable::Row row;
        Variant value;
        std::optional<platform::DateTime> time;  // of the last change; none before any
        uint64_t changes = 0;
    };

    TagBook(ReportTap& reports, const platform::Clock& clock, std::vector<TagTable::Row> rows);
    TagBook(const TagBook&) = delete;
    TagBook& operator=(const TagBook&) = delete;

    // In the order the rows were given.
    const std::vector<Tag>& tags() const { return tags_; }
    // The tag with that handle on that node (its name in any letter case); null when none.
    const Tag* find(std::string_view node, int32_t handle) const;

  private:
    void record(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                const VbArray<Variant>& values);

    const platform::Clock& clock_;
    std::vector<Tag> tags_;
    // Upper-cased node name -> handle -> index in tags_.
    std::map<std::string, std::unordered_map<int32_t, size_t>, std::less<>> index_;
    Subscription values_;
};

}  // namespace maroset::gateway
