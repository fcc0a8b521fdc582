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
    const std::string event = "{\"event\":\"ValueChange\",\"count\":1,";
    for (const auto& line : r.lines)
        EXPECT_EQ(line.rfind("{\"event\":\"ValueChange\",\"count\":", 0), 0u) << line;
    for (const std::string seen :
         {"\"handles\":[1],\"values\":[20]}", "\"handles\":[11],\"values\":[\"0\"]}",
          "\"handles\":[11],\"values\":[1]}"})
        EXPECT_NE(std::find(r.lines.begin(), r.lines.end(), event + seen), r.lines.end()) << seen;

    // The narration names the temporary drive root, which is gone afterwards.
    std::smatch root;
    ASSERT_TRUE(std::regex_search(r.errors, root, std::regex("Drive root (\\S+) \\(temporary\\)")))
        << r.errors;
    EXPECT_FALSE(std::filesystem::exists(root[1].str()));
    const std::string summary =
        "Stopped after 2 s: " + std::to_string(r.lines.size()) + " value changes, 0 driver errors.";
    EXPECT_NE(r.errors.find(summary), std::string::npos) << r.errors;
}

}  // namespace
}  // namespace maroset::test
