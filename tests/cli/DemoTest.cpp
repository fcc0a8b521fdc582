#include "cli/Demo.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <regex>

#include "CliProcess.h"

namespace maroset::test {
namespace {

TEST(DemoTest, ShowsValueChangesOfEveryStationAndCleansUp) {
    const auto r = RunCli({"demo", "--seconds", "2", "--json"});
    ASSERT_EQ(r.status, 0) << r.errors;
    // Events only on standard output; the disk tag is read back first, then counts.
    const std::string event = "{\"event\":\"ValueChange\",\"count\":";
    for (const auto& line : r.lines) EXPECT_EQ(line.rfind(event, 0), 0u) << line;
    for (const std::string seen :
         {"1,\"handles\":[1],\"values\":[20]}", "1,\"handles\":[11],\"values\":[\"0\"]}",
          "1,\"handles\":[11],\"values\":[1]}"})
        EXPECT_NE(std::find(r.lines.begin(), r.lines.end(), event + seen), r.lines.end()) << seen;
    // The coupler's first pass reports all of its tags at once.
    const std::string coupler = event + "5,\"handles\":[51,52,53,54,55],";
    EXPECT_TRUE(std::any_of(r.lines.begin(), r.lines.end(),
                            [&](const std::string& l) { return l.rfind(coupler, 0) == 0; }));

    // The narration names the temporary drive root, which is gone afterwards.
    std::smatch root;
    ASSERT_TRUE(std::regex_search(r.errors, root, std::regex("Drive root (\\S+) \\(temporary\\)")))
        << r.errors;
    EXPECT_FALSE(std::filesystem::exists(root[1].str()));
    const std::string summary =
        "Stopped after 2 s: " + std::to_string(r.lines.size()) + " value changes, 0 driver errors.";
    EXPECT_NE(r.errors.find(summary), std::string::npos)
        << r.errors << r.lines.size() << " lines on standard output, the last: "
        << (r.lines.empty() ? "" : r.lines.back());
}

}  // namespace
}  // namespace maroset::test
