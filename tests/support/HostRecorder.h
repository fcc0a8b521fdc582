#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "lang/Subscription.h"

namespace maroset::test {

// A host façade that records every event it receives.
class HostRecorder {
  public:
    struct Change {
        std::vector<int32_t> handles;
        int16_t count;
        std::vector<Variant> values;
        int32_t handlesLower;
        int32_t valuesLower;
    };
    struct Error {
        std::string driver, from, message;
    };

    HostRecorder();

    ClsNodeDBInterface host;
    std::vector<Change> changes;
    std::vector<Error> errors;

  private:
    Subscription values_;
    Subscription errors_;
};

}  // namespace maroset::test
