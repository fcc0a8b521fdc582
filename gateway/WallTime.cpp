#include "gateway/WallTime.h"

#include <time.h>

#include <cstdio>

namespace maroset::gateway {

using namespace std::chrono;

int64_t WallTime::offsetFor(platform::DateTime local) {
    const auto hour = floor<hours>(local);
    if (hour != hour_) {
        const local_days day = floor<days>(local);
        const year_month_day ymd{day};
        tm fields{};
        fields.tm_year = static_cast<int>(ymd.year()) - 1900;
        fields.tm_mon = static_cast<int>(static_cast<unsigned>(ymd.month())) - 1;
        fields.tm_mday = static_cast<int>(static_cast<unsigned>(ymd.day()));
        fields.tm_hour = static_cast<int>((hour - day).count());
        fields.tm_isdst = -1;
        const time_t utc = mktime(&fields);
        offset_ = static_cast<int64_t>(utc) - duration_cast<seconds>(hour.time_since_epoch()).count();
        hour_ = hour;
    }
    return offset_;
}

int64_t WallTime::epochMillis(platform::DateTime local) {
    return local.time_since_epoch().count() + offsetFor(local) * 1000;
}

std::string WallTime::iso8601(platform::DateTime local) {
    const int64_t offset = -offsetFor(local);  // local minus UTC
    const local_days day = floor<days>(local);
    const year_month_day ymd{day};
    const hh_mm_ss time{local - day};
    const int64_t offMinutes = (offset < 0 ? -offset : offset) / 60;
    char text[40];
    std::snprintf(text, sizeof text, "%04d-%02u-%02uT%02d:%02d:%02d.%03d%c%02d:%02d",
                  static_cast<int>(ymd.year()), static_cast<unsigned>(ymd.month()),
                  static_cast<unsigned>(ymd.day()), static_cast<int>(time.hours().count()),
                  static_cast<int>(time.minutes().count()),
                  static_cast<int>(time.seconds().count()),
                  static_cast<int>(time.subseconds().count()), offset < 0 ? '-' : '+',
                  static_cast<int>(offMinutes / 60), static_cast<int>(offMinutes % 60));
    return text;
}

}  // namespace maroset::gateway
