#pragma once

#include <chrono>
#include <string>

namespace maroset::platform {

// Local civil date and time, as the system's date-time values are.
using DateTime = std::chrono::local_time<std::chrono::milliseconds>;

// The zero date-time of the system's date values: 30 December 1899, midnight.
inline constexpr DateTime ZeroDate{
    std::chrono::local_days{std::chrono::year{1899} / 12 / 30}.time_since_epoch()};

// Wall-clock date and time.
class Clock {
  public:
    virtual ~Clock() = default;
    virtual DateTime now() const = 0;
};

// "M/D/YYYY", e.g. "3/7/2026".
std::string FormatShortDate(DateTime t);
// "h:mm:ss AM/PM", e.g. "9:05:03 PM", "12:00:00 AM".
std::string FormatLongTime(DateTime t);

}  // namespace maroset::platform
