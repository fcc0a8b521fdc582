#include "cli/Demo.h"

#include <gtest/gtest.h>

#include <regex>

#include "CliProcess.h"

namespace maroset::test {
namespace {

TEST(DemoTest, ShowsValueChangesOfEveryStationAndCleansUp) {
    const auto r = RunCli({"demo", "--seconds", "2", "--json"});
    ASSERT_EQ(r.status, 0) << r.errors;

    // Events only on standard output; the disk tag is read back first, then counts.
    ASSERT_GE(r.lines.size(), 4u);
    for (const auto& line : r.lines)
        EXPECT_EQ(line.rfind("{\"event\":\"ValueChange\",\"count\":1,", 0), 0u) << line;
    const auto has = [&](const std::string& text) {
        return std::find(r.lines.begin(), r.lines.end(), text) != r.lines.end();
    };
    EXPECT_TRUE(has("{\"event\":\"ValueChange\",\"count\":1,\"handles\":[1],\"values\":[20]}"));
    EXPECT_TRUE(has("{\"event\":\"ValueChange\",\"count\":1,\"handles\":[11],\"values\":[\"0\"]}"));
    EXPECT_TRUE(has("{\"event\":\"ValueChange\",\"count\":1,\"handles\":[11],\"values\":[1]}"));

    // The narration names the temporary drive root, which is gone afterwards.
    std::smatch root;
    ASSERT_TRUE(std::regex_search(r.errors, root, std::regex("Drive root (\\S+) \\(temporary\\)")))
        << r.errors;
    EXPECT_FALSE(std::filesystem::exists(root[1].str()));
    EXPECT_NE(r.errors.find("Stopped after 2 s: " + std::to_string(r.lines.size()) +
                            " value changes, 0 driver errors."),
              std::string::npos)
        << r.errors;
}

TEST(DemoTest, RefusesANonsenseDuration) {
    for (const char* seconds : {"0", "ten", "-3"}) {
        const auto r = RunCli({"demo", "--seconds", seconds});
        EXPECT_EQ(r.status, 2) << seconds;
    }
}

}  // namespace
}  // namespace maroset::test
