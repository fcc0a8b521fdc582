#pragma once

#include <pybind11/pybind11.h>

#include <utility>

#include "lang/Subscription.h"

namespace maroset::python {

// What `event.connect(callable)` returns: the handler stays connected as long as the object
// whose event it is, whether or not the host keeps this handle; disconnect() ends it early.
class Connection {
  public:
    // `callable` is held by the subscribed handler; the connection only borrows it.
    Connection(Subscription subscription, pybind11::handle callable)
        : subscription_(std::move(subscription)), callable_(callable) {}

    void disconnect() {
        subscription_.reset();
        callable_ = {};
    }
    bool connected() const { return static_cast<bool>(subscription_); }
    // The callable while connected, for the garbage collector's traversal.
    pybind11::handle callable() const { return callable_; }

  private:
    Subscription subscription_;
    pybind11::handle callable_;
};

}  // namespace maroset::python
