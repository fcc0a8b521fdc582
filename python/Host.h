#pragma once

#include "ConnectionList.h"
#include "core/ClsNodeDBInterface.h"

namespace maroset::python {

// The façade as Python creates it: its Python handlers go with it.
class Host final : public ClsNodeDBInterface {
  public:
    ConnectionList& connections() { return connections_; }

  private:
    // Declared after the events (in the base), so destroyed before them.
    ConnectionList connections_;
};

}  // namespace maroset::python
