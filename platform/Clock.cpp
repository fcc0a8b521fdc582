#include "platform/Clock.h"

#include <cstdio>

namespace maroset::platform {

std::string FormatShortDate(DateTime t) {
    const std::chrono::year_month_day ymd{std::chrono::floor<std::chrono::days>(t)};
    char buf[32];
    std::snprintf(buf, sizeof buf, "%u/%u/%04d", static_cast<unsigned>(ymd.month()),
                  static_cast<unsigned>(ymd.day()), static_cast<int>(ymd.year()));
    return buf;
}

std::string FormatLongTime(DateTime t) {
    const auto sinceMidnight = t - std::chrono::floor<std::chrono::days>(t);
    const std::chrono::hh_mm_ss hms{std::chrono::floor<std::chrono::seconds>(sinceMidnight)};
    const long hour = hms.hours().count();
    const long hour12 = hour % 12 == 0 ? 12 : hour % 12;
    char buf[32];
    std::snprintf(buf, sizeof buf, "%ld:%02ld:%02ld %s", hour12,
                  static_cast<long>(hms.minutes().count()),
                  static_cast<long>(hms.seconds().count()), hour < 12 ? "AM" : "PM");
    return buf;
}

}  // namespace maroset::platform
