#pragma once

#include <cstdint>

#include "platform/Clock.h"

namespace maroset::gateway {

// The system's clock tells local civil time; Sparkplug hosts want instants. Converts with the
// machine's time zone, the offset looked up once per local hour.
class WallTime {
  public:
    // Milliseconds since 1970-01-01 UTC.
    int64_t epochMillis(platform::DateTime local);

  private:
    // Seconds to add to local time for UTC, for the local hour `hour_`.
    int64_t offsetFor(platform::DateTime local);

    std::chrono::local_time<std::chrono::hours> hour_{std::chrono::hours::min()};
    int64_t offset_ = 0;
};

}  // namespace maroset::gateway
