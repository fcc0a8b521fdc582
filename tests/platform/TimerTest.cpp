#include "platform/Timer.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "core/VbError.h"
#include "platform/VirtualEventLoop.h"

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;

// A timer control on the virtual clock, with the time of every tick.
class TimerControl : public ::testing::Test {
  protected:
    TimerControl() : timer(std::make_unique<Timer>(loop)) {
        sub = timer->Tick.subscribe([this] {
            ticks.push_back(loop.now().count());
            if (onTick) onTick();
        });
    }

    void start(int32_t interval) {
        timer->Interval(interval);
        timer->Enabled(true);
    }

    VirtualEventLoop loop;
    std::unique_ptr<Timer> timer;
    std::vector<int64_t> ticks;
    std::function<void()> onTick;
    Subscription sub;
};

TEST_F(TimerControl, TicksEveryIntervalWhileEnabled) {
    start(1000);
    loop.advance(milliseconds(3500));
    EXPECT_EQ(ticks, (std::vector<int64_t>{1000, 2000, 3000}));
    timer->Enabled(false);
    loop.advance(milliseconds(5000));
    EXPECT_EQ(ticks.size(), 3u);
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(TimerControl, FiveSecondWatchdogFiresAtFiveThousandNotBefore) {
    start(5000);
    loop.advance(milliseconds(4999));
    EXPECT_TRUE(ticks.empty());
    loop.advance(milliseconds(1));
    EXPECT_EQ(ticks, (std::vector<int64_t>{5000}));
}

TEST_F(TimerControl, IntervalZeroNeverTicks) {
    timer->Enabled(true);
    loop.advance(milliseconds(10000));
    EXPECT_TRUE(ticks.empty());
    EXPECT_EQ(loop.pendingTimers(), 0u);
    timer->Interval(200);  // enabled already: the count starts now
    loop.advance(milliseconds(200));
    EXPECT_EQ(ticks, (std::vector<int64_t>{10200}));
    timer->Interval(0);
    loop.advance(milliseconds(10000));
    EXPECT_EQ(ticks.size(), 1u);
}

TEST_F(TimerControl, DisableThenEnableRestartsTheCount) {
    start(1000);
    loop.advance(milliseconds(700));
    timer->Enabled(false);
    timer->Enabled(true);
    loop.advance(milliseconds(999));
    EXPECT_TRUE(ticks.empty());
    loop.advance(milliseconds(1));
    EXPECT_EQ(ticks, (std::vector<int64_t>{1700}));
}

TEST_F(TimerControl, SettingIntervalWhileEnabledRestartsTheCount) {
    start(1000);
    loop.advance(milliseconds(900));
    timer->Interval(1000);
    loop.advance(milliseconds(1000));
    EXPECT_EQ(ticks, (std::vector<int64_t>{1900}));
}

TEST_F(TimerControl, EnablingAnEnabledTimerKeepsItsCount) {
    start(1000);
    loop.advance(milliseconds(600));
    timer->Enabled(true);
    loop.advance(milliseconds(400));
    EXPECT_EQ(ticks, (std::vector<int64_t>{1000}));
}

TEST_F(TimerControl, SettingsAreKeptWhileDisabled) {
    timer->Interval(250);
    EXPECT_EQ(timer->Interval(), 250);
    EXPECT_FALSE(timer->Enabled());
    loop.advance(milliseconds(1000));
    EXPECT_TRUE(ticks.empty());
    EXPECT_THROW(timer->Interval(-1), VbError);
    EXPECT_EQ(timer->Interval(), 250);
}

TEST_F(TimerControl, HandlerMayDisableTheTimer) {
    onTick = [this] { timer->Enabled(false); };
    start(100);
    loop.advance(milliseconds(1000));
    EXPECT_EQ(ticks, (std::vector<int64_t>{100}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(TimerControl, HandlerMayRestartTheTimerWithANewInterval) {
    onTick = [this] {
        if (ticks.size() == 1) timer->Interval(300);
    };
    start(100);
    loop.advance(milliseconds(1000));
    EXPECT_EQ(ticks, (std::vector<int64_t>{100, 400, 700, 1000}));
}

TEST_F(TimerControl, HandlerMayDestroyTheTimer) {
    onTick = [this] { timer.reset(); };
    start(100);
    loop.advance(milliseconds(1000));
    EXPECT_EQ(ticks, (std::vector<int64_t>{100}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(TimerControl, HandlerThatYieldsIsNotReenteredAndTicksOnceAfter) {
    int depth = 0;
    int maxDepth = 0;
    onTick = [&] {
        ++depth;
        maxDepth = std::max(maxDepth, depth);
        // The first tick yields for long enough that two more ticks fall due inside it.
        if (ticks.size() == 1) loop.advance(milliseconds(2500));
        --depth;
    };
    start(1000);
    loop.advance(milliseconds(1000));
    EXPECT_EQ(maxDepth, 1);
    // The ticks missed during the handler collapse into one, right after it returns.
    EXPECT_EQ(ticks, (std::vector<int64_t>{1000, 3500}));
    loop.advance(milliseconds(1000));
    EXPECT_EQ(ticks, (std::vector<int64_t>{1000, 3500, 4500}));
}

}  // namespace
}  // namespace maroset::platform
