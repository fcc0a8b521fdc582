#include "platform/VirtualEventLoop.h"

#include <gtest/gtest.h>

#include <fcntl.h>
#include <unistd.h>

#include <string>

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;

// Order and time of everything that runs, on the virtual clock: "name@ms ".
class VirtualLoop : public ::testing::Test {
  protected:
    void note(const std::string& name) {
        fired += name + "@" + std::to_string(loop.now().count()) + " ";
    }
    void at(int64_t delay, std::string name) {
        loop.schedule(milliseconds(delay), [this, name] { note(name); });
    }

    VirtualEventLoop loop;
    std::string fired;
};

TEST_F(VirtualLoop, PostsThenTimersInDueOrderEachAtItsOwnTimeAlsoUnderANestedPump) {
    at(300, "c");
    at(100, "a");
    loop.schedule(milliseconds(200), [this] {
        note("b1");
        loop.pump();  // runs what is due now, b2, and nothing later
        note("/b1");
    });
    at(200, "b2");  // same due time: order of scheduling
    loop.post([this] { note("post"); });
    loop.schedule(milliseconds(150), [this] {
        at(100, "in");   // due at 250
        at(950, "out");  // due at 1100, after this advance
        loop.post([this] { note("post150"); });
    });
    loop.advance(milliseconds(1000));
    EXPECT_EQ(fired, "post@0 a@100 post150@150 b1@200 b2@200 /b1@200 in@250 c@300 ");
    EXPECT_EQ(loop.now().count(), 1000);
    EXPECT_EQ(loop.pendingTimers(), 1u);
}

TEST_F(VirtualLoop, CancelledTimerNeverRunsEvenWhenAlreadyDue) {
    EventLoop::TimerId victim = 0, self = 0;
    loop.schedule(milliseconds(10), [&] { loop.cancel(victim); });
    victim = loop.schedule(milliseconds(10), [this] { note("victim"); });
    self = loop.schedule(milliseconds(20), [&] {
        loop.cancel(self);  // cancelling oneself while running is harmless
        note("self");
    });
    loop.advance(milliseconds(30));
    EXPECT_EQ(fired, "self@20 ");
    EXPECT_EQ(loop.pendingTimers(), 0u);
}

TEST_F(VirtualLoop, StopEndsOnlyTheInnermostRunAndRunEndsWhenNothingIsLeft) {
    loop.schedule(milliseconds(100), [this] {
        loop.schedule(milliseconds(50), [this] { loop.stop(); });
        loop.run();  // returns at 150 when the inner stop() runs
        note("nestedReturned");
    });
    at(400, "outer");
    loop.schedule(milliseconds(500), [this] { loop.stop(); });
    loop.schedule(milliseconds(600), [this] { at(1000, "late"); });
    loop.run();
    EXPECT_EQ(loop.now().count(), 500);
    loop.run();
    EXPECT_EQ(fired, "nestedReturned@150 outer@400 late@1600 ");
}

// Readiness watches on two non-blocking pipes, a and b.
class VirtualLoopWatch : public VirtualLoop {
  protected:
    void SetUp() override { ASSERT_EQ(pipe2(a, O_NONBLOCK) | pipe2(b, O_NONBLOCK), 0); }
    void TearDown() override {
        for (int fd : {a[0], a[1], b[0], b[1]}) close(fd);
    }
    static std::string drain(int fd) {
        char buf[16];
        const ssize_t n = read(fd, buf, sizeof buf);
        return n > 0 ? std::string(buf, static_cast<size_t>(n)) : "";
    }
    int a[2] = {-1, -1}, b[2] = {-1, -1};
};

TEST_F(VirtualLoopWatch, NestedPumpNeitherReentersAWatchNorRepeatsAStaleReport) {
    int depth = 0;
    loop.watch(a[0], EventLoop::Readable, [&](short) {
        note("a" + std::to_string(++depth));
        loop.pump();  // a is still readable but must not be called again; b is served
        note(drain(a[0]));
        --depth;
    });
    // The outer pump's report for b is stale once the nested pump has served it.
    loop.watch(b[0], EventLoop::Readable, [&](short) { note("b" + drain(b[0])); });
    ASSERT_EQ(write(a[1], "xy", 2) + write(b[1], "z", 1), 3);
    loop.pump();
    loop.pump();  // drained: nothing to report
    EXPECT_EQ(fired, "a1@0 bz@0 xy@0 ");
}

TEST_F(VirtualLoopWatch, ExchangeCompletesBeforeTimeMovesYetABusyDescriptorCannotHoldTime) {
    // A device that answers each request at once, and the party that reads the answer.
    loop.watch(a[0], EventLoop::Readable, [&](short) {
        if (!drain(a[0]).empty()) ASSERT_EQ(write(b[1], "ok", 2), 2);
    });
    loop.watch(b[0], EventLoop::Readable, [&](short) { note("b" + drain(b[0])); });
    loop.watch(b[1], EventLoop::Writable, [](short) {});  // ready at every look
    ASSERT_EQ(write(a[1], "?", 1), 1);
    at(500, "timer");
    loop.advance(milliseconds(1000));
    EXPECT_EQ(fired, "bok@0 timer@500 ");
    EXPECT_EQ(loop.now().count(), 1000);
}

}  // namespace
}  // namespace maroset::platform
