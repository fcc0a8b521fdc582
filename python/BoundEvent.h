#pragma once

#include <pybind11/pybind11.h>

#include <memory>
#include <utility>

#include "Connection.h"
#include "ConnectionList.h"
#include "EventHandlers.h"

namespace maroset::python {

// An event as Python sees it (`host.ValueChange`): connect(callable) subscribes a Python
// handler. Holds the Python object that owns the event while it lives.
template <class EventType>
class BoundEvent {
  public:
    BoundEvent(EventType& event, ConnectionList& connections, pybind11::object owner)
        : event_(event), connections_(connections), owner_(std::move(owner)) {}

    std::shared_ptr<Connection> connect(pybind11::function handler) {
        const pybind11::handle callable = handler;
        return connections_.add(event_.subscribe(PythonHandler(event_, std::move(handler))),
                                callable);
    }
    size_t handlerCount() const { return event_.handlerCount(); }

  private:
    EventType& event_;
    ConnectionList& connections_;
    pybind11::object owner_;
};

}  // namespace maroset::python
