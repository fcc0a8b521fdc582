#include "cli/CommandLine.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "CliProcess.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

TEST(CommandLineTest, MisuseExitsWithStatusTwoAndTheUsageOfTheCommand) {
    TempDir dir;
    const std::string p = (dir.path() / "p.db").string();
    // clang-format off
    const Lines rows[] = {
        {}, {"frob"}, {"run"}, {"run", p, "extra"}, {"run", p, "--colour"},
        {"run", p, "--drive-root"}, {"run", p, "--com", "ttyUSB0"},
        {"run", p, "--com", "0=/dev/ttyUSB0"}, {"run", p, "--com", ":1=/dev/ttyUSB0"},
        {"run", p, "--com", "Plc:x=/dev/ttyUSB0"}, {"run", p, "--modbus-port", "70000"},
        {"project"}, {"project", "frob"}, {"project", "init"}, {"project", "init", p, "more"},
        {"project", "list"}, {"project", "add", p, "OnlyName"},
        {"project", "add", p, "A", "MEMTAG", "--colour", "red"},
        {"project", "add", p, "A", "MEMTAG", "--update-rate", "fast"},
        {"project", "add", p, "A", "MEMTAG", "--port", "-1"},
        {"demo", "--seconds", "0"}, {"demo", "--seconds", "ten"}, {"demo", "--seconds", "-3"},
        {"sim"}, {"sim", "frob"}};
    // clang-format on
    for (const auto& args : rows) {
        const auto r = RunCli(args);
        const std::string usage =
            "usage: maroset " + (args.empty() || args[0] == "frob" ? "run" : args[0]);
        EXPECT_EQ(r.status, 2) << ::testing::PrintToString(args);
        EXPECT_NE(r.errors.find(usage), std::string::npos) << r.errors;
    }
    EXPECT_TRUE(std::filesystem::is_empty(dir.path())) << "a refused command made a file";
}

TEST(CommandLineTest, EveryCommandHasHelpOnStandardOutput) {
    // clang-format off
    const std::pair<Lines, std::string> rows[] = {
        {{"--help"}, "run PROJECT"}, {{"run", "--help"}, "run PROJECT"},
        {{"project", "--help"}, "project init PATH"}, {{"demo", "--help"}, "demo"},
        {{"sim", "--help"}, "sim KIND"},
        {{"project", "init", "--help"}, "project init PATH"},
        {{"project", "add", "-h"}, "project add PATH NAME DRIVER"},
        {{"project", "list", "x", "--help"}, "project list PATH"}};
    // clang-format on
    for (const auto& [args, usage] : rows) {
        const auto r = RunCli(args);
        const std::string first = "usage: maroset " + usage;
        EXPECT_EQ(r.status, 0) << first;
        EXPECT_EQ(r.lines.empty() ? "" : r.lines[0].substr(0, first.size()), first);
    }
}

}  // namespace
}  // namespace maroset::test
