#pragma once

#include <pybind11/pybind11.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "Connection.h"

namespace maroset::python {

// The Python handlers connected to the events of one object, owned alongside it: they are
// disconnected, and their callables released, when the object goes. A callable that refers
// back to the object makes a cycle the garbage collector can break: traverse() shows it the
// callables, clear() lets them go.
class ConnectionList {
  public:
    ConnectionList() = default;
    ~ConnectionList() { clear(); }
    ConnectionList(const ConnectionList&) = delete;
    ConnectionList& operator=(const ConnectionList&) = delete;

    std::shared_ptr<Connection> add(Subscription subscription, pybind11::handle callable) {
        std::erase_if(items_, [](const auto& c) { return !c->connected(); });
        items_.push_back(std::make_shared<Connection>(std::move(subscription), callable));
        return items_.back();
    }

    int traverse(visitproc visit, void* arg) const {
        for (const auto& connection : items_) {
            if (connection->connected()) Py_VISIT(connection->callable().ptr());
        }
        return 0;
    }

    void clear() {
        // Moved out first: a callable released here may reach this list again.
        const auto items = std::move(items_);
        items_.clear();
        for (const auto& connection : items) connection->disconnect();
    }

  private:
    std::vector<std::shared_ptr<Connection>> items_;
};

}  // namespace maroset::python
