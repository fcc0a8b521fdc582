#include "platform/Timer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <vector>

#include "platform/VirtualEventLoop.h"
#include "support/ErrorOf.h"

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;
using Ticks = std::vector<int64_t>;

// A timer control on the virtual clock, with the time of every tick.
class TimerControl : public ::testing::Test {
  protected:
    void start(int32_t interval) {
        timer->Interval(interval);
        timer->Enabled(true);
    }
    void advance(int64_t ms) { loop.advance(milliseconds(ms)); }

    VirtualEventLoop loop;
    std::unique_ptr<Timer> timer = std::make_unique<Timer>(loop);
    Ticks ticks;
    std::function<void()> onTick;
    Subscription sub = timer->Tick.subscribe([this] {
        ticks.push_back(loop.now().count());
        if (onTick) onTick();
    });
};

TEST_F(TimerControl, TicksEveryIntervalWhileEnabledAndNeverAtIntervalZero) {
    timer->Enabled(true);
    advance(5000);
    EXPECT_EQ(test::errorOf([&] { timer->Interval(-1); }), 380);
    timer->Interval(1000);  // enabled already: the count starts now
    advance(3500);
    timer->Interval(0);
    advance(5000);
    EXPECT_EQ(ticks, (Ticks{6000, 7000, 8000}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(TimerControl, FiveSecondTimerTicksAtFiveThousandAndRestartsOnlyWhenReenabled) {
    start(5000);
    advance(4999);
    EXPECT_TRUE(ticks.empty());
    advance(3001);
    timer->Enabled(true);  // already enabled: the count goes on, tick at 10000
    advance(2500);
    timer->Enabled(false);
    timer->Enabled(true);  // tick at 15500
    advance(7000);
    timer->Interval(5000);  // tick at 22500
    advance(5000);
    EXPECT_EQ(ticks, (Ticks{5000, 10000, 15500, 22500}));
}

TEST_F(TimerControl, HandlerMayRearmDisableOrDestroyItsTimer) {
    onTick = [this] {
        if (ticks.size() == 1) timer->Interval(300);
        if (ticks.size() == 3) timer->Enabled(false);
    };
    start(100);
    advance(1000);
    EXPECT_EQ(loop.pendingTimers(), 0u);
    onTick = [this] { timer.reset(); };
    timer->Enabled(true);
    advance(1000);
    EXPECT_EQ(ticks, (Ticks{100, 400, 700, 1300}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(TimerControl, HandlerThatYieldsIsNotReenteredAndTicksOnceAfter) {
    int depth = 0, maxDepth = 0;
    onTick = [&] {
        maxDepth = std::max(maxDepth, ++depth);
        // The first tick yields for long enough that two more ticks fall due inside it.
        if (ticks.size() == 1) advance(2500);
        --depth;
    };
    start(1000);
    advance(1000);
    advance(1000);
    EXPECT_EQ(maxDepth, 1);
    // The ticks missed during the handler collapse into one, right after it returns.
    EXPECT_EQ(ticks, (Ticks{1000, 3500, 4500}));
}

}  // namespace
}  // namespace maroset::platform
