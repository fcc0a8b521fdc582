#pragma once

#include <algorithm>
#include <memory>
#include <vector>

#include "Connection.h"

namespace maroset::python {

// The Python handlers connected to the events of one object, owned alongside it: they are
// disconnected, and their callables released, when the object goes.
class ConnectionList {
  public:
    ConnectionList() = default;
    ~ConnectionList() {
        for (const auto& connection : items_) connection->disconnect();
    }
    ConnectionList(const ConnectionList&) = delete;
    ConnectionList& operator=(const ConnectionList&) = delete;

    std::shared_ptr<Connection> add(Subscription subscription) {
        std::erase_if(items_, [](const auto& c) { return !c->connected(); });
        items_.push_back(std::make_shared<Connection>(std::move(subscription)));
        return items_.back();
    }

  private:
    std::vector<std::shared_ptr<Connection>> items_;
};

}  // namespace maroset::python
