#include "gateway/TagBook.h"

#include <algorithm>

#include "lang/Strings.h"

namespace maroset::gateway {

TagBook::TagBook(ReportTap& reports, const platform::Clock& clock, std::vector<TagTable::Row> rows)
    : clock_(clock) {
    tags_.reserve(rows.size());
    for (auto& row : rows) {
        index_[UCase(row.node)][row.handle] = tags_.size();
        tags_.push_back(Tag{std::move(row), Variant(), std::nullopt, 0});
    }
    values_ = reports.Values.subscribe(
        [this](std::string_view node, const VbArray<int32_t>& handles, int16_t count,
               const VbArray<Variant>& values) { record(node, handles, count, values); });
}

const TagBook::Tag* TagBook::find(std::string_view node, int32_t handle) const {
    const auto byNode = index_.find(UCase(node));
    if (byNode == index_.end()) return nullptr;
    const auto it = byNode->second.find(handle);
    return it == byNode->second.end() ? nullptr : &tags_[it->second];
}

void TagBook::record(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                     const VbArray<Variant>& values) {
    const auto byNode = index_.find(UCase(node));
    if (byNode == index_.end()) return;
    // Pairs by position, as far as both arrays and the count reach.
    const int32_t n = std::min({int32_t{count}, handles.size(), values.size()});
    const platform::DateTime now = clock_.now();
    for (int32_t i = 0; i < n; ++i) {
        const auto it = byNode->second.find(handles(handles.LBound() + i));
        if (it == byNode->second.end()) continue;
        Tag& tag = tags_[it->second];
        tag.value = values(values.LBound() + i);
        tag.time = now;
        ++tag.changes;
    }
}

}  // namespace maroset::gateway
