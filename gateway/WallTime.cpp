#include "gateway/WallTime.h"

#include <time.h>

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

}  // namespace maroset::gateway
