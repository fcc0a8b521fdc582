#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "drivers/softplc/ClsTXMessage.h"

namespace maroset {

// The client's keyed collection of unacknowledged frames, in the order they were added, with
// the collection's errors: a key added twice fails with 457, removing a key that is not there
// with 5.
//
// Visit through Items(), a snapshot: a handler that runs in the middle of a visit (the client
// pumps the loop while it sends) may add or remove entries; Contains() tells whether a
// visited entry is still queued.
class TXMessageQueue {
  public:
    void Add(std::shared_ptr<ClsTXMessage> item, const std::string& key);
    void Remove(const std::string& key);
    bool Contains(const ClsTXMessage* item) const;
    bool ContainsKey(const std::string& key) const;
    int32_t Count() const { return static_cast<int32_t>(entries_.size()); }
    std::vector<std::shared_ptr<ClsTXMessage>> Items() const;
    void Clear() { entries_.clear(); }

  private:
    std::vector<std::pair<std::string, std::shared_ptr<ClsTXMessage>>> entries_;
};

}  // namespace maroset
