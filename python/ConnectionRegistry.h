#pragma once

#include <map>
#include <memory>
#include <utility>

#include "ConnectionList.h"

namespace maroset::python {

// The Python handlers connected to objects that Python does not own (the process-wide
// nodeDB): kept here while the object lives, dropped at the first connect after it is gone.
class ConnectionRegistry {
  public:
    static ConnectionList& of(const std::shared_ptr<void>& owner) {
        static auto* entries = new std::map<const void*, Entry>();  // lives as long as the nodes
        std::erase_if(*entries, [](const auto& e) { return e.second.owner.expired(); });
        Entry& entry = (*entries)[owner.get()];
        if (!entry.list) entry = Entry{owner, std::make_unique<ConnectionList>()};
        return *entry.list;
    }

  private:
    struct Entry {
        std::weak_ptr<void> owner;
        std::unique_ptr<ConnectionList> list;
    };
};

}  // namespace maroset::python
