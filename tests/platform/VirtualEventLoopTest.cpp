#include "platform/VirtualEventLoop.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <unistd.h>

#include <string>
#include <utility>
#include <vector>

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;
using Fired = std::vector<std::pair<std::string, int64_t>>;

// Order and time of everything that runs, on the virtual clock.
class VirtualLoopOrder : public ::testing::Test {
  protected:
    void at(int64_t delay, std::string name) {
        loop.schedule(milliseconds(delay),
                      [this, name] { fired.emplace_back(name, loop.now().count()); });
    }

    VirtualEventLoop loop;
    Fired fired;
};

TEST_F(VirtualLoopOrder, TimersRunInDueOrderEachAtItsOwnTime) {
    at(300, "c");
    at(100, "a");
    at(200, "b1");
    at(200, "b2");  // same due time: order of scheduling
    loop.advance(milliseconds(1000));
    EXPECT_EQ(fired, (Fired{{"a", 100}, {"b1", 200}, {"b2", 200}, {"c", 300}}));
    EXPECT_EQ(loop.now().count(), 1000);
}

TEST_F(VirtualLoopOrder, DueTimeIsInclusiveAndNothingFiresEarly) {
    at(5000, "watchdog");
    loop.advance(milliseconds(4999));
    EXPECT_TRUE(fired.empty());
    EXPECT_EQ(loop.pendingTimers(), 1u);
    loop.advance(milliseconds(1));
    EXPECT_EQ(fired, (Fired{{"watchdog", 5000}}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(VirtualLoopOrder, TimersScheduledDuringAdvanceFireInsideTheWindow) {
    loop.schedule(milliseconds(100), [this] {
        at(50, "inside");    // due at 150
        at(950, "outside");  // due at 1050
    });
    loop.advance(milliseconds(1000));
    EXPECT_EQ(fired, (Fired{{"inside", 150}}));
    EXPECT_EQ(loop.pendingTimers(), 1u);
    loop.advance(milliseconds(50));
    EXPECT_EQ(fired.back(), (std::pair<std::string, int64_t>{"outside", 1050}));
}

TEST_F(VirtualLoopOrder, PostedCallsRunBeforeTimersAndBetweenThem) {
    at(0, "timer0");
    at(10, "timer10");
    at(10, "timer10b");
    loop.post([this] { fired.emplace_back("posted", loop.now().count()); });
    loop.schedule(milliseconds(5), [this] {
        loop.post([this] { fired.emplace_back("from5", loop.now().count()); });
    });
    loop.advance(milliseconds(20));
    EXPECT_EQ(
        fired,
        (Fired{{"posted", 0}, {"timer0", 0}, {"from5", 5}, {"timer10", 10}, {"timer10b", 10}}));
}

TEST_F(VirtualLoopOrder, CancelledTimerNeverRunsEvenWhenAlreadyDue) {
    EventLoop::TimerId victim = 0;
    loop.schedule(milliseconds(10), [&] { loop.cancel(victim); });
    victim = loop.schedule(milliseconds(10), [this] { fired.emplace_back("victim", 0); });
    EventLoop::TimerId self = 0;
    self = loop.schedule(milliseconds(20), [&] {
        loop.cancel(self);  // cancelling oneself while running is harmless
        fired.emplace_back("self", loop.now().count());
    });
    loop.advance(milliseconds(30));
    EXPECT_EQ(fired, (Fired{{"self", 20}}));
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(VirtualLoopOrder, RunStopsWhenNothingIsLeft) {
    at(100, "a");
    loop.schedule(milliseconds(250), [this] { at(1000, "late"); });
    loop.run();
    EXPECT_EQ(fired, (Fired{{"a", 100}, {"late", 1250}}));
    EXPECT_EQ(loop.now().count(), 1250);
}

TEST_F(VirtualLoopOrder, StopEndsOnlyTheInnermostRun) {
    loop.schedule(milliseconds(100), [this] {
        at(50, "nestedStop");
        loop.schedule(milliseconds(50), [this] { loop.stop(); });
        loop.run();  // returns at 150 when the inner stop() runs
        fired.emplace_back("nestedReturned", loop.now().count());
    });
    at(400, "outer");
    loop.schedule(milliseconds(500), [this] { loop.stop(); });
    at(600, "neverReached");
    loop.run();
    EXPECT_EQ(fired, (Fired{{"nestedStop", 150}, {"nestedReturned", 150}, {"outer", 400}}));
    EXPECT_EQ(loop.now().count(), 500);
    EXPECT_EQ(loop.pendingTimers(), 1u);
}

// What a callback that yields to pending events (pumps) may and may not see.
class VirtualLoopReentrancy : public VirtualLoopOrder {};

TEST_F(VirtualLoopReentrancy, PumpInsideTimerRunsOthersButNeverItself) {
    int depth = 0;
    int maxDepth = 0;
    loop.schedule(milliseconds(10), [&] {
        ++depth;
        maxDepth = std::max(maxDepth, depth);
        fired.emplace_back("pumper", loop.now().count());
        loop.pump();
        loop.pump();
        --depth;
    });
    at(10, "sibling");
    at(11, "later");
    loop.advance(milliseconds(10));
    EXPECT_EQ(maxDepth, 1);
    EXPECT_EQ(fired, (Fired{{"pumper", 10}, {"sibling", 10}}));
}

TEST_F(VirtualLoopReentrancy, PumpRunsOnlyWhatIsReadyNow) {
    int reposts = 0;
    std::function<void()> again = [&] {
        ++reposts;
        loop.post(again);  // a call that re-posts itself must not trap pump()
    };
    loop.post(again);
    at(0, "dueNow");
    at(1, "notYet");
    loop.pump();
    EXPECT_EQ(reposts, 1);
    EXPECT_EQ(fired, (Fired{{"dueNow", 0}}));
    loop.pump();
    EXPECT_EQ(reposts, 2);
}

class VirtualLoopWatch : public VirtualLoopOrder {
  protected:
    void SetUp() override { ASSERT_EQ(pipe(fds), 0); }
    void TearDown() override {
        for (int fd : fds)
            if (fd >= 0) close(fd);
    }
    int fds[2] = {-1, -1};
};

TEST_F(VirtualLoopWatch, ReadyDescriptorIsReportedAndNotReenteredByNestedPump) {
    int calls = 0;
    int depth = 0;
    int maxDepth = 0;
    std::string got;
    loop.watch(fds[0], EventLoop::Readable, [&](short revents) {
        ++calls;
        ++depth;
        maxDepth = std::max(maxDepth, depth);
        EXPECT_TRUE(revents & EventLoop::Readable);
        loop.pump();  // still readable: must not call us again
        char buf[16];
        const ssize_t n = read(fds[0], buf, sizeof buf);
        if (n > 0) got.append(buf, static_cast<size_t>(n));
        --depth;
    });
    ASSERT_EQ(write(fds[1], "ab", 2), 2);
    loop.pump();
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(maxDepth, 1);
    EXPECT_EQ(got, "ab");
    loop.pump();  // drained: nothing to report
    EXPECT_EQ(calls, 1);
}

TEST_F(VirtualLoopWatch, WatchServedByNestedPumpIsNotCalledAgainWithAStaleReport) {
    int other[2];
    ASSERT_EQ(pipe2(other, O_NONBLOCK), 0);
    int otherCalls = 0;
    loop.watch(fds[0], EventLoop::Readable, [&](short) {
        char c;
        ASSERT_EQ(read(fds[0], &c, 1), 1);
        loop.pump();  // serves and drains the other pipe
    });
    loop.watch(other[0], EventLoop::Readable, [&](short) {
        ++otherCalls;
        char c;
        EXPECT_EQ(read(other[0], &c, 1), 1);  // a second, stale call would find nothing
    });
    ASSERT_EQ(write(fds[1], "a", 1), 1);
    ASSERT_EQ(write(other[1], "b", 1), 1);
    loop.pump();
    EXPECT_EQ(otherCalls, 1);
    close(other[0]);
    close(other[1]);
}

TEST_F(VirtualLoopWatch, UnwatchInsideCallbackStopsFurtherCalls) {
    int calls = 0;
    EventLoop::WatchId id = 0;
    id = loop.watch(fds[0], EventLoop::Readable, [&](short) {
        ++calls;
        loop.unwatch(id);
    });
    ASSERT_EQ(write(fds[1], "x", 1), 1);
    loop.pump();
    loop.advance(milliseconds(100));
    loop.pump();
    EXPECT_EQ(calls, 1);
}

TEST_F(VirtualLoopWatch, ClosedDescriptorIsReportedOnceAsError) {
    std::vector<short> reports;
    loop.watch(fds[0], EventLoop::Readable, [&](short revents) { reports.push_back(revents); });
    close(fds[0]);
    fds[0] = -1;
    loop.pump();
    loop.pump();
    EXPECT_EQ(reports, (std::vector<short>{EventLoop::Error}));
}

TEST_F(VirtualLoopWatch, HangUpIsReportedWithoutAskingForIt) {
    short seen = 0;
    loop.watch(fds[0], 0, [&](short revents) { seen = revents; });
    close(fds[1]);
    fds[1] = -1;
    loop.pump();
    EXPECT_EQ(seen, EventLoop::HangUp);
}

TEST_F(VirtualLoopWatch, ExchangeBetweenWatchedPartiesCompletesWithoutTime) {
    int back[2];
    ASSERT_EQ(pipe(back), 0);
    std::string answer;
    // A device that answers each request at once, and the party that reads the answer.
    loop.watch(fds[0], EventLoop::Readable, [&](short) {
        char c;
        if (read(fds[0], &c, 1) == 1) ASSERT_EQ(write(back[1], "ok", 2), 2);
    });
    loop.watch(back[0], EventLoop::Readable, [&](short) {
        char buf[8];
        const ssize_t n = read(back[0], buf, sizeof buf);
        if (n > 0) answer.append(buf, static_cast<size_t>(n));
    });
    ASSERT_EQ(write(fds[1], "?", 1), 1);
    loop.advance(milliseconds(0));
    EXPECT_EQ(answer, "ok");
    EXPECT_EQ(loop.now().count(), 0);
    close(back[0]);
    close(back[1]);
}

TEST_F(VirtualLoopWatch, UndrainedDescriptorDoesNotHoldTimeStill) {
    int calls = 0;
    loop.watch(fds[0], EventLoop::Readable, [&](short) { ++calls; });  // never reads
    ASSERT_EQ(write(fds[1], "x", 1), 1);
    at(500, "timer");
    loop.advance(milliseconds(1000));
    EXPECT_EQ(fired, (Fired{{"timer", 500}}));
    EXPECT_EQ(loop.now().count(), 1000);
    EXPECT_GT(calls, 0);
}

}  // namespace
}  // namespace maroset::platform
