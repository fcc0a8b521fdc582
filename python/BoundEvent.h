#pragma once

#include <pybind11/pybind11.h>

#include <memory>
#include <utility>

#include "Connection.h"
#include "ConnectionList.h"
#include "EventHandlers.h"

namespace maroset::python {

// An event as Python sees it (`host.ValueChange`): connect(callable) subscribes a Python
// handler. Holds the event's owner alive while the Python object lives.
template <class EventType>
class BoundEvent {
  public:
    BoundEvent(EventType& event, ConnectionList& connections, std::shared_ptr<void> owner)
        : event_(event), connections_(connections), owner_(std::move(owner)) {}

    std::shared_ptr<Connection> connect(pybind11::function handler) {
        return connections_.add(event_.subscribe(PythonHandler(event_, std::move(handler))));
    }
    size_t handlerCount() const { return event_.handlerCount(); }

  private:
    EventType& event_;
    ConnectionList& connections_;
    std::shared_ptr<void> owner_;
};

}  // namespace maroset::python
