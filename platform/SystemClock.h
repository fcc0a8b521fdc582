#pragma once

#include "platform/Clock.h"

namespace maroset::platform {

// The machine's local time.
class SystemClock final : public Clock {
  public:
    DateTime now() const override;
};

}  // namespace maroset::platform
