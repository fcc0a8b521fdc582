#include "platform/Clock.h"

#include <gtest/gtest.h>

#include <time.h>

#include <string>

#include "platform/SystemClock.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"

namespace maroset::platform {
namespace {

using namespace std::chrono;

DateTime at(int y, int mo, int d, int h = 0, int mi = 0, int s = 0, int ms = 0) {
    return DateTime{local_days{year{y} / mo / d}.time_since_epoch()} + hours(h) + minutes(mi) +
           seconds(s) + milliseconds(ms);
}

TEST(DateFormat, ShortDateAndTwelveHourTimeOnTheVirtualAndTheSystemClock) {
    auto stamp = [](DateTime t) { return FormatShortDate(t) + " " + FormatLongTime(t); };
    EXPECT_EQ(stamp(at(2026, 3, 7, 21, 5, 3)), "3/7/2026 9:05:03 PM");
    EXPECT_EQ(stamp(at(2026, 12, 31, 23, 59, 59, 999)), "12/31/2026 11:59:59 PM");  // not rounded
    EXPECT_EQ(stamp(ZeroDate), "12/30/1899 12:00:00 AM");
    EXPECT_EQ(stamp(at(2026, 3, 7, 0, 59, 59)), "3/7/2026 12:59:59 AM");
    EXPECT_EQ(stamp(at(2026, 3, 7, 11, 59, 59)), "3/7/2026 11:59:59 AM");
    EXPECT_EQ(stamp(at(2026, 3, 7, 12)), "3/7/2026 12:00:00 PM");
    EXPECT_EQ(stamp(at(2026, 3, 7, 13)), "3/7/2026 1:00:00 PM");

    VirtualEventLoop loop;
    const VirtualClock clock(loop, at(2026, 3, 7, 23, 59, 58));
    loop.advance(milliseconds(2500));
    EXPECT_EQ(stamp(clock.now()), "3/8/2026 12:00:00 AM");

    const time_t t = time(nullptr);
    tm p{};
    localtime_r(&t, &p);
    const DateTime local =
        at(p.tm_year + 1900, p.tm_mon + 1, p.tm_mday, p.tm_hour, p.tm_min, p.tm_sec);
    EXPECT_LT(abs(SystemClock().now() - local), seconds(2));  // local time, not UTC
}

}  // namespace
}  // namespace maroset::platform
