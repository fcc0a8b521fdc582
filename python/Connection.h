#pragma once

#include <utility>

#include "lang/Subscription.h"

namespace maroset::python {

// What `event.connect(callable)` returns: the handler stays connected as long as the object
// whose event it is, whether or not the host keeps this handle; disconnect() ends it early.
class Connection {
  public:
    explicit Connection(Subscription subscription) : subscription_(std::move(subscription)) {}

    void disconnect() { subscription_.reset(); }
    bool connected() const { return static_cast<bool>(subscription_); }

  private:
    Subscription subscription_;
};

}  // namespace maroset::python
