#include "platform/SystemClock.h"

#include <time.h>

namespace maroset::platform {

DateTime SystemClock::now() const {
    using namespace std::chrono;
    const auto wall = system_clock::now();
    const time_t secs = system_clock::to_time_t(wall);
    tm local{};
    localtime_r(&secs, &local);
    const auto ms = duration_cast<milliseconds>(wall.time_since_epoch()) % seconds(1);
    const local_days day{year{local.tm_year + 1900} / (local.tm_mon + 1) / local.tm_mday};
    // to_time_t truncates toward zero, so the milliseconds are never negative after 1970.
    return DateTime{day.time_since_epoch()} + hours(local.tm_hour) + minutes(local.tm_min) +
           seconds(local.tm_sec) + (ms < milliseconds::zero() ? milliseconds::zero() : ms);
}

}  // namespace maroset::platform
