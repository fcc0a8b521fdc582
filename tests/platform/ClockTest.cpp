#include "platform/Clock.h"

#include <gtest/gtest.h>

#include <time.h>

#include "platform/SystemClock.h"
#include "platform/VirtualClock.h"
#include "platform/VirtualEventLoop.h"

namespace maroset::platform {
namespace {

using namespace std::chrono;

DateTime at(int y, unsigned mo, unsigned d, int h = 0, int mi = 0, int s = 0, int ms = 0) {
    return DateTime{local_days{year{y} / mo / d}.time_since_epoch()} + hours(h) + minutes(mi) +
           seconds(s) + milliseconds(ms);
}

TEST(DateFormat, MonthAndDayHaveNoLeadingZeros) {
    EXPECT_EQ(FormatShortDate(at(2026, 3, 7)), "3/7/2026");
    EXPECT_EQ(FormatShortDate(at(2026, 12, 31, 23, 59, 59, 999)), "12/31/2026");
    EXPECT_EQ(FormatShortDate(at(2000, 2, 29, 12)), "2/29/2000");
    EXPECT_EQ(FormatShortDate(ZeroDate), "12/30/1899");
}

TEST(DateFormat, TimeUsesTwelveHourClock) {
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 21, 5, 3)), "9:05:03 PM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 9, 0, 0)), "9:00:00 AM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 0, 0, 0)), "12:00:00 AM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 0, 59, 59)), "12:59:59 AM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 12, 0, 0)), "12:00:00 PM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 11, 59, 59)), "11:59:59 AM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 13, 0, 0)), "1:00:00 PM");
    EXPECT_EQ(FormatLongTime(at(2026, 3, 7, 23, 59, 59, 999)), "11:59:59 PM");  // not rounded
}

TEST(DateFormat, VirtualClockMovesWithTheLoop) {
    VirtualEventLoop loop;
    const VirtualClock clock(loop, at(2026, 3, 7, 23, 59, 58));
    loop.advance(milliseconds(2500));
    EXPECT_EQ(FormatShortDate(clock.now()), "3/8/2026");
    EXPECT_EQ(FormatLongTime(clock.now()), "12:00:00 AM");
}

TEST(DateFormat, SystemClockIsLocalTime) {
    const time_t before = time(nullptr);
    const DateTime now = SystemClock().now();
    const time_t after = time(nullptr);
    auto local = [](time_t t) {
        tm parts{};
        localtime_r(&t, &parts);
        return at(parts.tm_year + 1900, static_cast<unsigned>(parts.tm_mon + 1),
                  static_cast<unsigned>(parts.tm_mday), parts.tm_hour, parts.tm_min, parts.tm_sec);
    };
    EXPECT_GE(now, local(before));
    EXPECT_LT(now, local(after) + seconds(1));
}

}  // namespace
}  // namespace maroset::platform
