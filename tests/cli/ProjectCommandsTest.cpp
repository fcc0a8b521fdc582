#include "cli/ProjectCommands.h"

#include <gtest/gtest.h>

#include "CliProcess.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

class ProjectCommandsTest : public ::testing::Test {
  protected:
    std::string path() const { return (dir_.path() / "plant.db").string(); }
    CliResult project(std::vector<std::string> args) {
        args.insert(args.begin(), "project");
        return RunCli(args);
    }

    TempDir dir_;
};

TEST_F(ProjectCommandsTest, InitMakesAnEmptyProjectAndRefusesToOverwriteIt) {
    EXPECT_EQ(project({"init", path()}).status, 0);
    EXPECT_EQ(project({"list", path()}).lines, Lines{"No nodes in " + path()});
    EXPECT_EQ(project({"add", path(), "Line1", "DISKTAG"}).status, 0);

    const auto again = project({"init", path()});
    EXPECT_EQ(again.status, 1);
    EXPECT_NE(again.errors.find("(error 3204)"), std::string::npos) << again.errors;
    EXPECT_EQ(project({"list", path(), "--json"}).lines.size(), 1u);  // still there
}

TEST_F(ProjectCommandsTest, AddFillsTheColumnsItIsGivenAndLeavesTheRestNull) {
    ASSERT_EQ(project({"init", path()}).status, 0);
    ASSERT_EQ(project({"add", path(), "Plc", "NuvAbDf1", "--update-rate", "500", "--comm-port", "2",
                       "--baud-rate=19200", "--tag-prefix", "N7:", "--opc-server", "S",
                       "--opc-topic", "T", "--ip-address", "10.0.0.5", "--port", "2000"})
                  .status,
              0);
    ASSERT_EQ(project({"add", path(), "Mem", "MEMTAG"}).status, 0);
    EXPECT_EQ(project({"list", path(), "--json"}).lines,
              (Lines{"{\"Name\":\"Plc\",\"Driver\":\"NuvAbDf1\",\"OPCServer\":\"S\","
                     "\"OPCTopic\":\"T\",\"UpdateRate\":500,\"CommPort\":2,\"BaudRate\":19200,"
                     "\"TagPrefex\":\"N7:\",\"IPAddress\":\"10.0.0.5\",\"Port\":2000}",
                     "{\"Name\":\"Mem\",\"Driver\":\"MEMTAG\",\"OPCServer\":null,"
                     "\"OPCTopic\":null,\"UpdateRate\":null,\"CommPort\":null,\"BaudRate\":null,"
                     "\"TagPrefex\":null,\"IPAddress\":null,\"Port\":null}"}));
    EXPECT_EQ(project({"list", path()}).lines,
              (Lines{"Name  Driver    Settings",
                     "Plc   NuvAbDf1  OPCServer=S OPCTopic=T UpdateRate=500 CommPort=2 "
                     "BaudRate=19200 TagPrefex=N7: IPAddress=10.0.0.5 Port=2000",
                     "Mem   MEMTAG"}));
}

TEST_F(ProjectCommandsTest, NamesAreUniqueInAnyLetterCase) {
    ASSERT_EQ(project({"init", path()}).status, 0);
    ASSERT_EQ(project({"add", path(), "Line1", "MEMTAG"}).status, 0);
    const auto twice = project({"add", path(), "LINE1", "DISKTAG"});
    EXPECT_EQ(twice.status, 1);
    EXPECT_NE(twice.errors.find("already has a node named 'LINE1'"), std::string::npos);
    EXPECT_EQ(project({"list", path(), "--json"}).lines.size(), 1u);
}

TEST_F(ProjectCommandsTest, MissingDatabaseIsReportedWithTheEngineNumber) {
    for (const auto& args : std::vector<Lines>{{"add", path(), "A", "MEMTAG"}, {"list", path()}}) {
        const auto r = project(args);
        EXPECT_EQ(r.status, 1) << args[0];
        EXPECT_NE(r.errors.find("(error 3024)"), std::string::npos) << r.errors;
    }
}

TEST_F(ProjectCommandsTest, AProjectItMadeLoadsInRun) {
    ASSERT_EQ(project({"init", path()}).status, 0);
    ASSERT_EQ(project({"add", path(), "Mem", "MEMTAG", "--update-rate", "100"}).status, 0);
    ASSERT_EQ(project({"add", path(), "Disk", "DiskTag"}).status, 0);
    const auto r =
        RunCli({"run", path(), "--drive-root", (dir_.path() / "c").string(), "--json"}, "nodes\n");
    EXPECT_EQ(r.lines, (Lines{"{\"reply\":\"load\",\"ok\":true}",
                              "{\"reply\":\"nodes\",\"ok\":true,\"nodes\":[{\"name\":\"Mem\","
                              "\"driver\":\"MEMTAG\"},{\"name\":\"Disk\",\"driver\":\"DiskTag\"}]}",
                              "{\"reply\":\"quit\",\"ok\":true}"}));
}

TEST_F(ProjectCommandsTest, UsageErrorsExitWithStatusTwo) {
    for (const auto& args : std::vector<Lines>{
             {"project"},
             {"project", "frob"},
             {"project", "init"},
             {"project", "init", path(), "more"},
             {"project", "add", path(), "OnlyName"},
             {"project", "add", path(), "A", "MEMTAG", "--update-rate", "fast"},
             {"project", "add", path(), "A", "MEMTAG", "--port", "-1"},
             {"project", "add", path(), "A", "MEMTAG", "--colour", "red"},
             {"project", "list"},
             {},
             {"frob"},
         }) {
        const auto r = RunCli(args);
        EXPECT_EQ(r.status, 2) << (args.empty() ? "(none)" : args.back());
        EXPECT_NE(r.errors.find("usage: maroset"), std::string::npos) << r.errors;
    }
    EXPECT_FALSE(std::filesystem::exists(path()));
}

TEST_F(ProjectCommandsTest, EverySubcommandHasHelp) {
    for (const auto& [args, first] : std::vector<std::pair<Lines, std::string>>{
             {{"--help"}, "usage: maroset run PROJECT"},
             {{"project", "--help"}, "usage: maroset project init PATH"},
             {{"project", "init", "--help"}, "usage: maroset project init PATH"},
             {{"project", "add", "-h"}, "usage: maroset project add PATH NAME DRIVER"},
             {{"project", "list", "x", "--help"}, "usage: maroset project list PATH"},
             {{"demo", "--help"}, "usage: maroset demo"},
         }) {
        const auto r = RunCli(args);
        EXPECT_EQ(r.status, 0);
        ASSERT_FALSE(r.lines.empty());
        EXPECT_EQ(r.lines[0].rfind(first, 0), 0u) << r.lines[0];
    }
}

}  // namespace
}  // namespace maroset::test
