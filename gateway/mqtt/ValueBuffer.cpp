#include "gateway/mqtt/ValueBuffer.h"

#include <utility>

namespace maroset::gateway {

bool ValueBuffer::push(TagChange change) {
    if (limit_ == 0) {
        ++dropped_;
        return false;
    }
    const bool room = changes_.size() < limit_;
    if (!room) {
        changes_.pop_front();
        ++dropped_;
    }
    changes_.push_back(std::move(change));
    return room;
}

std::deque<TagChange> ValueBuffer::take() {
    return std::exchange(changes_, {});
}

}  // namespace maroset::gateway
