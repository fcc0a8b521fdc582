#include "platform/PollEventLoop.h"

#include <gtest/gtest.h>

#include <time.h>
#include <unistd.h>

#include <string>
#include <vector>

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;

double seconds(clockid_t clock) {
    timespec ts{};
    clock_gettime(clock, &ts);
    return static_cast<double>(ts.tv_sec) + static_cast<double>(ts.tv_nsec) / 1e9;
}

// The real loop on the monotonic clock. Delays are short; no assertion depends on how
// quickly the machine runs, only on order and counts.
class RealLoop : public ::testing::Test {
  protected:
    PollEventLoop loop;
    std::vector<std::string> seen;
};

TEST_F(RealLoop, TimersFireInDueOrderAndStopEndsRun) {
    loop.schedule(milliseconds(30), [this] { seen.push_back("30"); });
    loop.schedule(milliseconds(10), [this] { seen.push_back("10"); });
    loop.schedule(milliseconds(20), [this] { seen.push_back("20"); });
    loop.schedule(milliseconds(40), [this] { loop.stop(); });
    const auto started = loop.now();
    loop.run();
    EXPECT_EQ(seen, (std::vector<std::string>{"10", "20", "30"}));
    EXPECT_GE((loop.now() - started).count(), 40);
}

TEST_F(RealLoop, PostRunsAtTheNextTurnNotInsidePost) {
    loop.post([this] {
        seen.push_back("first");
        loop.post([this] { seen.push_back("third"); });
        seen.push_back("second");
    });
    EXPECT_TRUE(seen.empty());
    loop.pump();
    EXPECT_EQ(seen, (std::vector<std::string>{"first", "second"}));
    loop.pump();
    EXPECT_EQ(seen, (std::vector<std::string>{"first", "second", "third"}));
}

TEST_F(RealLoop, NestedRunForIsEndedByStopButTheOuterRunGoesOn) {
    loop.schedule(milliseconds(5), [this] {
        loop.schedule(milliseconds(5), [this] { loop.stop(); });
        loop.runFor(milliseconds(100000));
        seen.push_back("nestedReturned");
        loop.schedule(milliseconds(5), [this] { loop.stop(); });
    });
    loop.run();
    EXPECT_EQ(seen, (std::vector<std::string>{"nestedReturned"}));
}

TEST_F(RealLoop, PumpInsideTimerRunsDueSiblingsButNotItself) {
    int depth = 0;
    int maxDepth = 0;
    loop.schedule(milliseconds(0), [&] {
        ++depth;
        maxDepth = std::max(maxDepth, depth);
        seen.push_back("pumper");
        loop.pump();
        --depth;
    });
    loop.schedule(milliseconds(0), [this] { seen.push_back("sibling"); });
    loop.runFor(milliseconds(5));
    EXPECT_EQ(maxDepth, 1);
    EXPECT_EQ(seen, (std::vector<std::string>{"pumper", "sibling"}));
}

// Readiness watches on a pipe.
class RealLoopPipe : public RealLoop {
  protected:
    void SetUp() override { ASSERT_EQ(pipe(fds), 0); }
    void TearDown() override {
        for (int fd : fds)
            if (fd >= 0) close(fd);
    }
    void closeEnd(int i) {
        close(fds[i]);
        fds[i] = -1;
    }
    int fds[2] = {-1, -1};
};

TEST_F(RealLoopPipe, DataWrittenLaterWakesTheLoop) {
    std::string got;
    loop.watch(fds[0], EventLoop::Readable, [&](short revents) {
        ASSERT_TRUE(revents & EventLoop::Readable);
        char buf[16];
        const ssize_t n = read(fds[0], buf, sizeof buf);
        if (n > 0) got.append(buf, static_cast<size_t>(n));
        loop.stop();
    });
    loop.schedule(milliseconds(10), [this] { ASSERT_EQ(write(fds[1], "hello", 5), 5); });
    loop.run();
    EXPECT_EQ(got, "hello");
}

TEST_F(RealLoopPipe, WatchIsNotReenteredByPumpFromItsOwnCallback) {
    int calls = 0;
    int depth = 0;
    int maxDepth = 0;
    loop.watch(fds[0], EventLoop::Readable, [&](short) {
        ++calls;
        ++depth;
        maxDepth = std::max(maxDepth, depth);
        loop.pump();  // the pipe is still readable
        loop.pump();
        char c;
        ASSERT_EQ(read(fds[0], &c, 1), 1);
        --depth;
    });
    ASSERT_EQ(write(fds[1], "x", 1), 1);
    loop.pump();
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(maxDepth, 1);
}

TEST_F(RealLoopPipe, HangUpIsReportedAndUnwatchInsideCallbackSticks) {
    std::vector<short> reports;
    EventLoop::WatchId id = 0;
    id = loop.watch(fds[0], EventLoop::Readable, [&](short revents) {
        reports.push_back(revents);
        loop.unwatch(id);
    });
    closeEnd(1);
    loop.runFor(milliseconds(20));
    ASSERT_EQ(reports.size(), 1u);
    EXPECT_TRUE(reports[0] & EventLoop::HangUp);
}

TEST_F(RealLoopPipe, ClosedDescriptorDoesNotSpin) {
    int calls = 0;
    short report = 0;
    loop.watch(fds[0], EventLoop::Readable, [&](short revents) {
        ++calls;
        report = revents;
    });
    closeEnd(0);
    loop.runFor(milliseconds(30));
    EXPECT_EQ(calls, 1);
    EXPECT_EQ(report, EventLoop::Error);
}

TEST_F(RealLoopPipe, IdleLoopSleeps) {
    int ticks = 0;
    loop.watch(fds[0], EventLoop::Readable, [](short) {});
    loop.schedule(milliseconds(200), [&] { ++ticks; });
    const double cpu0 = seconds(CLOCK_PROCESS_CPUTIME_ID);
    const double wall0 = seconds(CLOCK_MONOTONIC);
    loop.runFor(milliseconds(400));
    const double cpu = seconds(CLOCK_PROCESS_CPUTIME_ID) - cpu0;
    const double wall = seconds(CLOCK_MONOTONIC) - wall0;
    EXPECT_EQ(ticks, 1);
    EXPECT_LT(cpu, 0.2 * wall) << "cpu " << cpu << " s over " << wall << " s";
}

}  // namespace
}  // namespace maroset::platform
