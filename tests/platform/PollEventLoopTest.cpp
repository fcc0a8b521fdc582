#include "platform/PollEventLoop.h"

#include <gtest/gtest.h>

#include <poll.h>
#include <unistd.h>

#include <ctime>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;

// The real loop on the monotonic clock, with a pipe to watch. Delays are short; no assertion
// depends on how quickly the machine runs, only on order and counts (and the idle test).
class RealLoop : public ::testing::Test {
  protected:
    void SetUp() override { ASSERT_EQ(pipe(fds), 0); }
    void TearDown() override {
        for (int fd : fds) close(fd);
    }
    PollEventLoop loop;
    std::string seen;
    int fds[2] = {-1, -1};
};

TEST_F(RealLoop, PostsTimersAndPipeReadinessRunInOrderUntilStop) {
    std::function<void()> again = [&] {
        if (seen.empty()) seen = "posted ";
        // Re-posting itself until the data is in must not starve timers and descriptors.
        if (seen.find("hello") == std::string::npos) loop.post(again);
    };
    loop.post(again);
    EXPECT_EQ(seen, "");  // never inside post()
    EventLoop::WatchId id = 0;
    id = loop.watch(fds[0], EventLoop::Readable, [&](short revents) {
        char buf[16];
        const ssize_t n = read(fds[0], buf, sizeof buf);
        seen += std::to_string(revents) + ":" +
                std::string(buf, static_cast<size_t>(n > 0 ? n : 0)) + " ";
        if (revents & EventLoop::HangUp) loop.unwatch(id);  // else a hung-up pipe would spin
    });
    loop.schedule(milliseconds(100), [this] { close(std::exchange(fds[1], -1)); });
    loop.schedule(milliseconds(10), [this] { ASSERT_EQ(write(fds[1], "hello", 5), 5); });
    loop.schedule(milliseconds(150), [this] { loop.stop(); });
    loop.run();
    // Readable (1) with the data, then HangUp (16) though only Readable was asked for.
    EXPECT_EQ(seen, "posted 1:hello 16: ");
}

TEST_F(RealLoop, IdleLoopSleepsEvenWithAClosedDescriptorWatched) {
    int ticks = 0;
    std::vector<short> dead;
    const int closed = dup(fds[0]);
    close(closed);
    loop.watch(closed, EventLoop::Readable, [&](short revents) { dead.push_back(revents); });
    loop.watch(fds[0], EventLoop::Readable, [](short) {});
    loop.schedule(milliseconds(200), [&] { ++ticks; });
    const std::clock_t cpu0 = std::clock();  // CPU time of the whole process
    const auto wall0 = loop.now();
    loop.runFor(milliseconds(400));
    const double cpu = static_cast<double>(std::clock() - cpu0) / CLOCKS_PER_SEC;
    const double wall = static_cast<double>((loop.now() - wall0).count()) / 1000;
    EXPECT_EQ(ticks, 1);
    EXPECT_EQ(dead, (std::vector<short>{EventLoop::Error}));  // reported once, then left out
    EXPECT_LT(cpu, 0.2 * wall) << "cpu " << cpu << " s over " << wall << " s";
}

// Whether fd is readable now.
bool readable(int fd) {
    pollfd p{fd, POLLIN, 0};
    return ::poll(&p, 1, 0) == 1 && (p.revents & POLLIN);
}

TEST_F(RealLoop, AnotherLoopWaitsOnTheReadinessDescriptorAndTheNextTimeout) {
    const int ready = loop.readinessFd();
    EXPECT_EQ(loop.prepareExternalWait(), std::nullopt) << "nothing to do: wait for the fd";
    EXPECT_FALSE(readable(ready));

    loop.post([&] { seen += "posted "; });  // from outside the loop: wakes the waiter
    EXPECT_TRUE(readable(ready));
    EXPECT_EQ(loop.prepareExternalWait(), milliseconds(0));
    EXPECT_FALSE(readable(ready)) << "prepare drains the wake-up";
    loop.pump();

    loop.schedule(milliseconds(60'000), [] {});
    const auto wait = loop.prepareExternalWait();
    ASSERT_TRUE(wait.has_value());
    EXPECT_GT(*wait, milliseconds(50'000));

    loop.watch(fds[0], EventLoop::Readable, [&](short) {
        char buf[8];
        seen += std::string(buf, static_cast<size_t>(read(fds[0], buf, sizeof buf))) + " ";
    });
    loop.prepareExternalWait();
    EXPECT_FALSE(readable(ready));
    ASSERT_EQ(write(fds[1], "data", 4), 4);
    EXPECT_TRUE(readable(ready)) << "a watched descriptor is ready";
    loop.pump();
    loop.prepareExternalWait();
    EXPECT_FALSE(readable(ready));
    EXPECT_EQ(seen, "posted data ");
}

TEST_F(RealLoop, SleepHooksRunAroundWaitsThatBlockOnly) {
    std::string hooks;
    loop.setSleepHooks([&] { hooks += "("; }, [&] { hooks += ")"; });
    loop.post([&] { hooks += "p"; });
    loop.pump();  // never waits
    loop.schedule(milliseconds(5), [&] { hooks += "t"; });
    loop.runFor(milliseconds(20));
    EXPECT_EQ(hooks.substr(0, 4), "p()t") << hooks;
}

}  // namespace
}  // namespace maroset::platform
