#include "drivers/softplc/TXMessageQueue.h"

#include <algorithm>

#include "lang/VbError.h"

namespace maroset {

void TXMessageQueue::Add(std::shared_ptr<ClsTXMessage> item, const std::string& key) {
    if (ContainsKey(key)) throw VbError(err::DuplicateKey);
    entries_.emplace_back(key, std::move(item));
}

void TXMessageQueue::Remove(const std::string& key) {
    const auto it = std::find_if(entries_.begin(), entries_.end(),
                                 [&](const auto& e) { return e.first == key; });
    if (it == entries_.end()) throw VbError(err::InvalidProcedureCall);
    entries_.erase(it);
}

bool TXMessageQueue::Contains(const ClsTXMessage* item) const {
    return std::any_of(entries_.begin(), entries_.end(),
                       [&](const auto& e) { return e.second.get() == item; });
}

bool TXMessageQueue::ContainsKey(const std::string& key) const {
    return std::any_of(entries_.begin(), entries_.end(),
                       [&](const auto& e) { return e.first == key; });
}

std::vector<std::shared_ptr<ClsTXMessage>> TXMessageQueue::Items() const {
    std::vector<std::shared_ptr<ClsTXMessage>> items;
    items.reserve(entries_.size());
    for (const auto& e : entries_) items.push_back(e.second);
    return items;
}

}  // namespace maroset
