#include "cli/ProjectCommands.h"

#include <gtest/gtest.h>

#include "CliProcess.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

class ProjectCommandsTest : public ::testing::Test {
  protected:
    // `maroset project COMMAND PATH ARGS...` on plant.db in a fresh directory.
    CliResult project(const std::string& command, const Lines& args = {}) {
        Lines all{"project", command, path};
        all.insert(all.end(), args.begin(), args.end());
        return RunCli(all);
    }

    TempDir dir_;
    const std::string path = (dir_.path() / "plant.db").string();
};

TEST_F(ProjectCommandsTest, InitAddAndListFillOnlyTheColumnsGiven) {
    // Failures exit with status 1 and say why.
    std::vector<std::pair<CliResult, std::string>> failed{
        {project("add", {"A", "MEMTAG"}), "(error 3024)"}, {project("list"), "(error 3024)"}};
    EXPECT_EQ(project("init").status, 0);
    EXPECT_EQ(project("list").lines, Lines{"No nodes in " + path});
    ASSERT_EQ(project("add", {"Plc", "NuvAbDf1", "--update-rate", "500", "--comm-port", "2",
                              "--baud-rate=19200", "--tag-prefix", "N7:", "--opc-server", "S",
                              "--opc-topic", "T", "--ip-address", "10.0.0.5", "--port", "2000"})
                  .status,
              0);
    ASSERT_EQ(project("add", {"Mem", "MEMTAG"}).status, 0);
    // Names are unique in any letter case, and an existing project is never overwritten.
    failed.push_back({project("add", {"MEM", "DISKTAG"}), "already has a node named 'MEM'"});
    failed.push_back({project("init"), "(error 3204)"});
    for (const auto& [r, why] : failed) {
        EXPECT_EQ(r.status, 1) << why;
        EXPECT_NE(r.errors.find(why), std::string::npos) << r.errors;
    }
    EXPECT_EQ(project("list", {"--json"}).lines,
              (Lines{"{\"Name\":\"Plc\",\"Driver\":\"NuvAbDf1\",\"OPCServer\":\"S\","
                     "\"OPCTopic\":\"T\",\"UpdateRate\":500,\"CommPort\":2,\"BaudRate\":19200,"
                     "\"TagPrefex\":\"N7:\",\"IPAddress\":\"10.0.0.5\",\"Port\":2000}",
                     "{\"Name\":\"Mem\",\"Driver\":\"MEMTAG\",\"OPCServer\":null,"
                     "\"OPCTopic\":null,\"UpdateRate\":null,\"CommPort\":null,\"BaudRate\":null,"
                     "\"TagPrefex\":null,\"IPAddress\":null,\"Port\":null}"}));
    EXPECT_EQ(project("list").lines,
              (Lines{"Name  Driver    Settings",
                     "Plc   NuvAbDf1  OPCServer=S OPCTopic=T UpdateRate=500 CommPort=2 "
                     "BaudRate=19200 TagPrefex=N7: IPAddress=10.0.0.5 Port=2000",
                     "Mem   MEMTAG"}));
}

TEST_F(ProjectCommandsTest, AProjectItMadeLoadsInRun) {
    ASSERT_EQ(project("init").status, 0);
    ASSERT_EQ(project("add", {"Mem", "MEMTAG", "--update-rate", "100"}).status, 0);
    ASSERT_EQ(project("add", {"Disk", "DiskTag"}).status, 0);
    const auto r =
        RunCli({"run", path, "--drive-root", (dir_.path() / "c").string(), "--json"}, "nodes\n");
    EXPECT_EQ(r.lines, (Lines{"{\"reply\":\"load\",\"ok\":true}",
                              "{\"reply\":\"nodes\",\"ok\":true,\"nodes\":[{\"name\":\"Mem\","
                              "\"driver\":\"MEMTAG\"},{\"name\":\"Disk\",\"driver\":\"DiskTag\"}]}",
                              "{\"reply\":\"quit\",\"ok\":true}"}));
}

}  // namespace
}  // namespace maroset::test
