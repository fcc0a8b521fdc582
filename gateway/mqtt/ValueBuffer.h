#pragma once

#include <cstddef>
#include <cstdint>
#include <deque>

#include "gateway/TagDirectory.h"
#include "lang/Variant.h"
#include "platform/Clock.h"

namespace maroset::gateway {

// One change of a tag's value, as it was reported.
struct TagChange {
    TagEntry* tag = nullptr;
    Variant value;
    platform::DateTime time{};
};

// The changes made while the broker cannot take them, in the order they were reported, up to
// a limit: past it the oldest go first and are counted, so what is replayed is always the
// most recent stretch.
class ValueBuffer {
  public:
    explicit ValueBuffer(size_t limit) : limit_(limit) {}

    // False when an older change had to make room (or the limit is 0 and this one is lost).
    bool push(TagChange change);
    // Everything kept, oldest first; the buffer is empty afterwards.
    std::deque<TagChange> take();

    size_t size() const { return changes_.size(); }
    // Changes lost to the limit since the service started.
    uint64_t dropped() const { return dropped_; }

  private:
    size_t limit_;
    std::deque<TagChange> changes_;
    uint64_t dropped_ = 0;
};

}  // namespace maroset::gateway
