#include "drivers/local/ClsDriverDiskTag.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <thread>

#include "lang/Conversions.h"
#include "platform/Database.h"
#include "support/HostRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

// Kill rounds: the defaults are the figures the files must stand; MAROSET_KILL_SCALE (a
// percentage) shortens or lengthens every loop.
int Rounds(int full) {
    const char* scale = std::getenv("MAROSET_KILL_SCALE");
    return scale ? std::max(1, full * std::atoi(scale) / 100) : full;
}

class DiskTagKills : public test::RuntimeFixture {
  protected:
    fs::path file() const { return driveRoot() / "NUVDiskIO" / "Line1.mdb"; }

    // How long `work` takes in a child, fork included, run to its end.
    template <class Work>
    Clock::duration lasts(Work work) {
        const auto start = Clock::now();
        const pid_t child = fork();
        if (child == 0) {
            work();
            ::_exit(0);
        }
        waitpid(child, nullptr, 0);
        return Clock::now() - start;
    }

    // Runs `work` in a child and kills it after `delay` (it may have finished by then).
    template <class Work>
    void killedAfter(Clock::duration delay, Work work) {
        const pid_t child = fork();
        ASSERT_GE(child, 0);
        if (child == 0) {
            work();
            ::_exit(0);
        }
        std::this_thread::sleep_for(delay);
        ::kill(child, SIGKILL);
        int status = 0;
        ASSERT_EQ(waitpid(child, &status, 0), child);
    }

    // The value the file holds for Level, as a fresh driver reads it back.
    int32_t storedLevel() {
        ClsDriverDiskTag reader;
        reader.startup("ServerName", "Line1");
        reader.AddItem("Level", 5);
        host.changes.clear();
        reader.ReadItem(5);
        EXPECT_EQ(host.changes.size(), 1u);
        return host.changes.empty() ? -1 : CLng(host.changes.back().values.at(0));
    }

    test::HostRecorder host;
    std::mt19937 random{20260307};
};

TEST_F(DiskTagKills, KilledCreationLeavesNoFileOrAWholeOneAndTheNextStartWorks) {
    const auto create = [] {
        ClsDriverDiskTag created;
        created.startup("ServerName", "Line1");
    };
    // Kills fall anywhere from before the creation to a little after it.
    std::uniform_int_distribution<Clock::rep> at(0, lasts(create).count() * 3 / 2);
    int none = 0, whole = 0;
    for (int round = 0, rounds = Rounds(200); round < rounds; ++round) {
        fs::remove(file());
        killedAfter(Clock::duration(at(random)), create);
        if (!fs::exists(file())) {
            ++none;
        } else {
            ++whole;
            ASSERT_FALSE(platform::Database::Blank(file())) << "round " << round;
        }
        ClsDriverDiskTag next;
        ASSERT_NO_THROW(next.startup("ServerName", "Line1")) << "round " << round;
        ASSERT_NO_THROW(next.AddItem("Level", 5)) << "round " << round;
        ASSERT_NO_THROW(next.WriteItem(5, round)) << "round " << round;
        ASSERT_EQ(storedLevel(), round);
    }
    // Otherwise the kills never met a creation under way.
    EXPECT_GT(none, 0);
    EXPECT_GT(whole, 0);
}

TEST_F(DiskTagKills, BlankFileLeftByAnOlderVersionIsReplacedOnStart) {
    fs::create_directories(file().parent_path());
    for (const bool header : {false, true}) {
        { std::ofstream(file(), std::ios::trunc); }
        if (header) platform::Database::Create(file());  // a database without any table
        ASSERT_TRUE(platform::Database::Blank(file()));
        ClsDriverDiskTag driver;
        driver.startup("ServerName", "Line1");
        driver.AddItem("Level", 5);
        driver.WriteItem(5, 3);
        EXPECT_EQ(storedLevel(), 3);
        fs::remove(file());
    }
}

TEST_F(DiskTagKills, EveryWriteReportedBeforeAKillIsInTheFile) {
    ClsDriverDiskTag driver;
    driver.startup("ServerName", "Line1");
    driver.AddItem("Level", 5);
    driver.WriteItem(5, 0);
    int32_t stored = 0;
    int acknowledged = 0;
    // Kills fall within the first few writes of each child.
    const auto span = lasts([&] {
        for (int v = 1; v <= 4; ++v) driver.WriteItem(5, v);
    });
    stored = storedLevel();
    std::uniform_int_distribution<Clock::rep> at(0, span.count() * 2);
    for (int round = 0, rounds = Rounds(1000); round < rounds; ++round) {
        int pipe[2];
        ASSERT_EQ(::pipe(pipe), 0);
        killedAfter(Clock::duration(at(random)), [&] {
            ::close(pipe[0]);
            // Each value is told to the parent the moment the host has it.
            auto told = host.host.ValueChange.subscribe(
                [&](VbArray<int32_t>&, int16_t, VbArray<Variant>& values) {
                    const int32_t v = CLng(values(1));
                    (void)!::write(pipe[1], &v, sizeof v);
                });
            for (int32_t v = stored + 1; v < stored + 100000; ++v) driver.WriteItem(5, v);
        });
        ::close(pipe[1]);
        int32_t last = stored, v = 0;
        while (::read(pipe[0], &v, sizeof v) == sizeof v) last = v;
        ::close(pipe[0]);
        if (last != stored) ++acknowledged;
        const int32_t now = storedLevel();
        // The write under way at the kill may have reached the disk unreported.
        ASSERT_TRUE(now == last || now == last + 1)
            << "round " << round << ": reported " << last << ", file holds " << now;
        stored = now;
    }
    EXPECT_GT(acknowledged, Rounds(1000) / 10) << "kills within " << std::chrono::duration<double, std::milli>(span * 2).count() << " ms" << "the kills came before any write";
}

}  // namespace
}  // namespace maroset
