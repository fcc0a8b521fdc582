#include "cli/HostSession.h"

#include <gtest/gtest.h>

#include <fstream>
#include <map>

#include "CliProcess.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

const std::string kNodesTable =
    "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
    "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, IPAddress TEXT, "
    "Port INTEGER);";

std::string reply(const std::string& name, const std::string& rest = "\"ok\":true") {
    return "{\"reply\":\"" + name + "\"," + rest + "}";
}

// An error reply; one about a node names it.
std::string failure(const std::string& name, int number, const std::string& node = "") {
    // clang-format off
    static const std::map<int, std::string> descriptions{
        {5, "Invalid procedure call or argument"}, {6, "Overflow"}, {9, "Subscript out of range"},
        {13, "Type mismatch"}, {91, "Object variable or With block variable not set"},
        {457, "This key is already associated with an element of this collection"}};
    // clang-format on
    return reply(name, "\"ok\":false,\"error\":{\"number\":" + std::to_string(number) +
                           ",\"description\":\"" + descriptions.at(number) + "\"}" +
                           (node.empty() ? "" : ",\"node\":\"" + node + "\""));
}

std::string valueChange(const std::string& handle, const std::string& value) {
    return "{\"event\":\"ValueChange\",\"count\":1,\"handles\":[" + handle + "],\"values\":[" +
           value + "]}";
}

std::string nodesReply(const std::string& list) {
    return reply("nodes", "\"ok\":true,\"nodes\":[" + list + "]");
}

// A project database and a drive root in a fresh directory.
class HostFixture : public ::testing::Test {
  protected:
    std::filesystem::path project() const { return dir_.path() / "project.db"; }
    std::filesystem::path driveRoot() const { return dir_.path() / "drive_c"; }
    void makeProject(const std::string& rows) { RunSqlScript(project(), kNodesTable + rows); }

    Lines runArgs(Lines extra = {"--json"}) const {
        extra.insert(extra.begin(),
                     {"run", project().string(), "--drive-root", driveRoot().string()});
        return extra;
    }

    TempDir dir_;
};

// ---- Loading the project ------------------------------------------------------------------

TEST_F(HostFixture, MissingProjectIsAMessageAndStatusOne) {
    const auto r = RunCli({"run", "/nonexistent/p.db"});
    EXPECT_EQ(r.status, 1);
    EXPECT_TRUE(r.lines.empty());
    EXPECT_NE(r.errors.find("not found"), std::string::npos) << r.errors;
}

TEST_F(HostFixture, LoadErrorsAreTheLoadReplyAndTheNodesLoadedBeforeAreListed) {
    const std::string insert = kNodesTable + "INSERT INTO Nodes (Name, Driver) VALUES ";
    // clang-format off
    const struct { std::string script, load, nodes; } rows[] = {
        {"CREATE TABLE Other (x TEXT);",
         "{\"reply\":\"load\",\"ok\":false,\"error\":{\"number\":3078,", ""},
        // In project order, the driver as written.
        {insert + "('Ab', 'DiskTag'), ('M\xe9ter', 'memtag'), ('AB', 'MEMTAG'), ('B', 'MEMTAG');",
         failure("load", 457),
         "{\"name\":\"Ab\",\"driver\":\"DiskTag\"},"
         "{\"name\":\"M\\u00e9ter\",\"driver\":\"memtag\"}"},
        // Whatever Init makes of Null, the node is listed.
        {insert + "('Alpha', NULL);", "{\"reply\":\"load\"",
         "{\"name\":\"Alpha\",\"driver\":null}"}};
    // clang-format on
    for (const auto& row : rows) {
        std::filesystem::remove(project());
        RunSqlScript(project(), row.script);
        auto lines = RunCli(runArgs(), "nodes\n").lines;
        lines.resize(std::max<size_t>(lines.size(), 2));
        EXPECT_EQ(lines[0].rfind(row.load, 0), 0u) << lines[0];
        EXPECT_EQ(lines[1], nodesReply(row.nodes)) << row.script;
    }
}

// ---- Commands on memory tags ----------------------------------------------------------------

// A project with the memory node Mem.
class HostCommands : public HostFixture {
  protected:
    void SetUp() override {
        makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');");
    }
    // Registers tag 7, then runs `input`: everything printed. Replies come while the input is
    // still open.
    Lines memSession(const std::string& input, const Lines& extra = {"--json"}) {
        const auto r = RunCli(runArgs(extra), "add Mem 7 Level\n" + input, 2);
        EXPECT_GE(r.linesWhileOpen, 2u) << "no reply before the end of input";
        return r.lines;
    }
    const Lines start{reply("load"), reply("add")};
};

TEST_F(HostCommands, WrittenValuesComeBackBeforeTheReplyAndKeepTheirKind) {
    // Text is escaped byte by byte.
    // clang-format off
    const std::pair<std::string, std::string> rows[] = {
        {"42", "42"}, {"-17", "-17"}, {"3000000000", "3000000000"}, {"1.5e20", "1.5E+20"},
        {"True", "true"}, {"false", "false"}, {"Level", "\"Level\""}, {"\"12\"", "\"12\""},
        {"\"two  words\"", "\"two  words\""},
        {"\"say \\\"hi\\\" \\\\ now\"", "\"say \\\"hi\\\" \\\\ now\""},
        {"caf\xe9", "\"caf\\u00e9\""}, {"\"a\tb\x01\x7f\xff\"", "\"a\\tb\\u0001\\u007f\\u00ff\""}};
    // clang-format on
    std::string input;
    Lines expected = start;
    for (const auto& [value, json] : rows) {
        // No newline after the last line: the end of input runs it, then quits.
        input += (input.empty() ? "" : "\n") + std::string("write Mem 7 ") + value;
        expected.insert(expected.end(), {valueChange("7", json), reply("write")});
    }
    expected.push_back(reply("quit"));
    EXPECT_EQ(memSession(input), expected);
}

TEST_F(HostCommands, RefusedCommandsAreErrorRepliesAndTheSessionGoesOn) {
    const std::pair<Lines, int> refused[] = {
        {{"frobnicate", "add Mem 8", "add Mem x Level", "add Mem 99999999999 Level", "read Mem",
          "read Mem 7 8", "remove Mem 1.5", "write Mem 7", "write Mem 7 1 2", "write Mem 7 \"open",
          "write Mem 7 \"a\"b", "writearray Mem 7", "start now", "nodes all", "sleep", "sleep -5",
          "addnode OnlyName", "addnode N MEMTAG T slow", "quit now"},
         5},
        {{"write Mem 7 1e999"}, 6},
        {{"add Nope 1 A", "remove Nope 1", "read Nope 1", "write Nope 1 2", "writearray Nope 1 2"},
         91}};
    std::string input;
    Lines expected = start;
    for (const auto& [lines, number] : refused) {
        for (const auto& line : lines) {
            input += line + "\n";
            expected.push_back(
                failure(line.substr(0, line.find(' ')), number, number == 91 ? "Nope" : ""));
        }
    }
    expected.insert(expected.end(), {valueChange("7", "1"), reply("write"), reply("quit")});
    EXPECT_EQ(memSession(input + "write Mem 7 1\n"), expected);
}

TEST_F(HostCommands, CommandsRunInOrderAndQuitIgnoresTheRest) {
    // Command words ignore letter case, blank and comment lines are skipped, the handle goes to
    // the node as text, an array write is not reported back; nodes come and go.
    EXPECT_EQ(
        memSession("start\nsleep 50\nWRITE Mem 0007 1\r\n\n# note\n  \r\n"
                   "writearray Mem 7 1 2.5 \"x y\" true\nstop\n"
                   "addnode Extra MemTag Topic 250 3\naddnode extra MEMTAG\nnodes\n"
                   "removenode Mem\nremovenode Mem\nwrite Mem 7 1\nremoveall\nnodes\n"
                   "quit\nwrite Mem 7 2\n"),
        (Lines{reply("load"), reply("add"), reply("start"), reply("sleep"), valueChange("7", "1"),
               reply("write"), reply("writearray"), reply("stop"), reply("addnode"),
               failure("addnode", 457, "extra"),
               nodesReply("{\"name\":\"Mem\",\"driver\":\"MEMTAG\"},"
                          "{\"name\":\"Extra\",\"driver\":\"MemTag\"}"),
               reply("removenode"), failure("removenode", 5, "Mem"), failure("write", 91, "Mem"),
               reply("removeall"), nodesReply(""), reply("quit")}));
}

TEST_F(HostCommands, EventsAndRepliesAreReadableLinesWithoutJson) {
    EXPECT_EQ(memSession("write Mem 7 2.5\nwrite Mem 7 \"a \\\"b\\\"\"\nwrite Mem 7 TRUE\n"
                         "write Nope 7 1\nbogus\nnodes\n",
                         {}),
              (Lines{"load: ok", "add: ok", "ValueChange  7 = 2.5", "write: ok",
                     "ValueChange  7 = \"a \\\"b\\\"\"", "write: ok", "ValueChange  7 = True",
                     "write: ok", "write: error 91: Object variable or With block variable not set",
                     "bogus: error 5: Invalid procedure call or argument (unknown command)",
                     "nodes: ok: Mem (MEMTAG)", "quit: ok"}));
}

// ---- Disk tags and trapping -----------------------------------------------------------------

TEST_F(HostFixture, DiskTagValuesSurviveARestartOfTheCommand) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Line1', 'DISKTAG');");
    EXPECT_EQ(RunCli(runArgs(), "add Line1 5 Level\nwrite Line1 5 12.5\n").lines,
              (Lines{reply("load"), reply("add"), valueChange("5", "12.5"), reply("write"),
                     reply("quit")}));
    EXPECT_TRUE(std::filesystem::exists(driveRoot() / "NUVDiskIO" / "Line1.mdb"));
    EXPECT_EQ(RunCli(runArgs(), "add Line1 5 Level\nread Line1 5\nwrite Line1 6 1\n").lines,
              (Lines{reply("load"), reply("add"), valueChange("5", "\"12.5\""), reply("read"),
                     failure("write", 9, "Line1"), reply("quit")}));
}

TEST_F(HostCommands, TrapLogsErrorsUnderTheDriveRootAndTheReplyIsOk) {
    EXPECT_EQ(memSession("write Mem seven 1\n"),
              (Lines{reply("load"), reply("add"), failure("write", 13, "Mem"), reply("quit")}));
    EXPECT_FALSE(std::filesystem::exists(driveRoot() / "MarosetErrors.txt"));
    // The port options are taken along.
    EXPECT_EQ(memSession("write Mem seven 1\n",
                         {"--json", "--trap", "--com", "1=/dev/null", "--com=Plc:2=/dev/zero",
                          "--trace", "--modbus-port", "1502"}),
              (Lines{reply("load"), reply("add"), reply("write"), reply("quit")}));
    std::ifstream in(driveRoot() / "MarosetErrors.txt");
    const std::string log{std::istreambuf_iterator<char>(in), {}};
    EXPECT_NE(log.find("Error #13"), std::string::npos) << log;
    EXPECT_NE(log.find("Module\\Sub: node.WriteTag"), std::string::npos) << log;
}

// ---- Link status ---------------------------------------------------------------------------

class HostStatus : public HostFixture {
  protected:
    HostStatus() {
        makeProject(
            "INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');"
            "INSERT INTO Nodes (Name, Driver, OPCServer) VALUES ('Opc', 'OPC', 'No.Such.Server');");
    }
};

TEST_F(HostStatus, StatusTellsTheLinksAndAnErrorAboutANodeNamesIt) {
    const auto lines = RunCli(runArgs(),
                              "add Mem 1 A\nwrite Mem 1 5\nstatus\nstatus opc\nstatus Pump\n"
                              "read Pump 1\nwrite Mem x 1\nnodes extra\n")
                           .lines;
    ASSERT_EQ(lines.size(), 11u);
    const std::string& all = lines[4];
    EXPECT_EQ(
        all.rfind(
            R"({"reply":"status","ok":true,"nodes":[{"name":"Mem","driver":"MEMTAG","link":{"state":"local","since":")",
            0),
        0u)
        << all;
    EXPECT_NE(all.find(R"("values":1,"driverErrors":0},"last":null}})"), std::string::npos) << all;
    EXPECT_NE(all.find(R"({"name":"Opc","driver":"OPC","link":{"state":"down",)"),
              std::string::npos);
    EXPECT_NE(all.find(R"("last":{"text":"did not start: error )"), std::string::npos) << all;

    EXPECT_EQ(lines[5].rfind(R"({"reply":"status","ok":true,"nodes":[{"name":"Opc",)", 0), 0u);
    EXPECT_EQ(lines[5].find("Mem"), std::string::npos);
    EXPECT_EQ(lines[6], failure("status", 91, "Pump"));
    EXPECT_EQ(lines[7], failure("read", 91, "Pump"));
    EXPECT_EQ(lines[8], failure("write", 13, "Mem"));
    EXPECT_EQ(lines[9], failure("nodes", 5)) << "a command about no node names none";
}

TEST_F(HostStatus, ReadableStatusIsOneLineForAllNodes) {
    const auto lines = RunCli(runArgs({}), "status\n").lines;
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_EQ(lines[1].rfind("status: ok: Mem (MEMTAG) local since ", 0), 0u) << lines[1];
    EXPECT_NE(lines[1].find(", 0 values, 0 driver errors; Opc (OPC) down since "),
              std::string::npos)
        << lines[1];
    EXPECT_NE(lines[1].find(", last: did not start: error "), std::string::npos);
}

}  // namespace
}  // namespace maroset::test
