#include "cli/HostSession.h"

#include <gtest/gtest.h>

#include <fstream>
#include <sstream>

#include "CliProcess.h"
#include "support/SqlScript.h"
#include "support/TempDir.h"

namespace maroset::test {
namespace {

using Lines = std::vector<std::string>;

constexpr const char* kNodesTable =
    "CREATE TABLE Nodes (Name TEXT, Driver TEXT, OPCServer TEXT, OPCTopic TEXT, "
    "UpdateRate INTEGER, CommPort INTEGER, BaudRate INTEGER, TagPrefex TEXT, IPAddress TEXT, "
    "Port INTEGER);";

std::string reply(const std::string& name, const std::string& rest = "\"ok\":true") {
    return "{\"reply\":\"" + name + "\"," + rest + "}";
}

std::string failure(const std::string& name, int number, const std::string& description) {
    return reply(name, "\"ok\":false,\"error\":{\"number\":" + std::to_string(number) +
                           ",\"description\":\"" + description + "\"}");
}

std::string valueChange(const std::string& handles, const std::string& values) {
    const int count = static_cast<int>(std::count(handles.begin(), handles.end(), ',')) + 1;
    return "{\"event\":\"ValueChange\",\"count\":" + std::to_string(count) + ",\"handles\":[" +
           handles + "],\"values\":[" + values + "]}";
}

const std::string kInvalidArgument = "Invalid procedure call or argument";
const std::string kNotSet = "Object variable or With block variable not set";

// A project database and a drive root in a fresh directory.
class HostFixture : public ::testing::Test {
  protected:
    std::filesystem::path project() const { return dir_.path() / "project.db"; }
    std::filesystem::path driveRoot() const { return dir_.path() / "drive_c"; }

    void makeProject(const std::string& rows) { RunSqlScript(project(), kNodesTable + rows); }

    std::vector<std::string> runArgs(std::vector<std::string> extra = {"--json"}) const {
        std::vector<std::string> args{"run", project().string(), "--drive-root",
                                      driveRoot().string()};
        args.insert(args.end(), extra.begin(), extra.end());
        return args;
    }

    std::string driveFile(const std::string& relative) const {
        std::ifstream in(driveRoot() / relative, std::ios::binary);
        std::ostringstream text;
        text << in.rdbuf();
        return text.str();
    }

  private:
    TempDir dir_;
};

// ---- Loading the project ------------------------------------------------------------------

using HostLoad = HostFixture;

TEST_F(HostLoad, MissingProjectIsAMessageAndStatusOne) {
    const auto r = RunCli({"run", (std::filesystem::path("/nonexistent") / "p.db").string()});
    EXPECT_EQ(r.status, 1);
    EXPECT_TRUE(r.lines.empty());
    EXPECT_NE(r.errors.find("not found"), std::string::npos) << r.errors;
}

TEST_F(HostLoad, MissingNodesTableIsTheLoadReply) {
    RunSqlScript(project(), "CREATE TABLE Other (x TEXT);");
    const auto r = RunCli(runArgs(), "nodes\n");
    ASSERT_EQ(r.status, 0);
    ASSERT_EQ(r.lines.size(), 3u);
    EXPECT_EQ(r.lines[0].rfind("{\"reply\":\"load\",\"ok\":false,\"error\":{\"number\":3078,", 0),
              0u)
        << r.lines[0];
    EXPECT_EQ(r.lines[1], reply("nodes", "\"ok\":true,\"nodes\":[]"));
    EXPECT_EQ(r.lines[2], reply("quit"));
}

TEST_F(HostLoad, DuplicateNameEndsTheLoadAndKeepsTheNodesBeforeIt) {
    makeProject(
        "INSERT INTO Nodes (Name, Driver) VALUES ('Line1', 'DiskTag'), ('Mem', 'MEMTAG'), "
        "('LINE1', 'MEMTAG'), ('After', 'MEMTAG');");
    const auto r = RunCli(runArgs(), "nodes\n");
    ASSERT_EQ(r.lines.size(), 3u);
    EXPECT_EQ(
        r.lines[0],
        failure("load", 457, "This key is already associated with an element of this collection"));
    EXPECT_EQ(r.lines[1],
              reply("nodes",
                    "\"ok\":true,\"nodes\":[{\"name\":\"Line1\",\"driver\":\"DiskTag\"},"
                    "{\"name\":\"Mem\",\"driver\":\"MEMTAG\"}]"));
}

TEST_F(HostLoad, NodesAreListedInProjectOrderWithTheDriverAsWritten) {
    // The node without a driver comes last: whatever its Init makes of Null, it is listed.
    makeProject(
        "INSERT INTO Nodes (Name, Driver) VALUES ('Zeta', 'memtag'), ('M\xe9ter', 'Whatever'), "
        "('Alpha', NULL);");
    const auto r = RunCli(runArgs(), "nodes\n");
    ASSERT_EQ(r.lines.size(), 3u);
    EXPECT_EQ(r.lines[1], reply("nodes",
                                "\"ok\":true,\"nodes\":[{\"name\":\"Zeta\",\"driver\":\"memtag\"},"
                                "{\"name\":\"M\\u00e9ter\",\"driver\":\"Whatever\"},"
                                "{\"name\":\"Alpha\",\"driver\":null}]"));
}

// ---- Commands on memory tags ----------------------------------------------------------------

class HostCommands : public HostFixture {
  protected:
    void SetUp() override {
        makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');");
        cli_.emplace(runArgs());
        ASSERT_EQ(cli_->untilReply(), Lines{reply("load")});
        ASSERT_EQ(cli_->command("add Mem 7 Level"), Lines{reply("add")});
    }
    Lines command(const std::string& line) { return cli_->command(line); }
    // The values a write of `value` to handle 7 reports back.
    std::string echoed(const std::string& value) {
        const auto lines = command("write Mem 7 " + value);
        if (lines.size() != 2 || lines[1] != reply("write")) return "unexpected: " + lines.back();
        return lines[0];
    }

    std::optional<CliProcess> cli_;
};

TEST_F(HostCommands, WriteReportsTheValueBeforeItsReply) {
    EXPECT_EQ(command("write Mem 7 3.5"), (Lines{valueChange("7", "3.5"), reply("write")}));
}

TEST_F(HostCommands, ValuesKeepTheirKindInJson) {
    EXPECT_EQ(echoed("42"), valueChange("7", "42"));
    EXPECT_EQ(echoed("-17"), valueChange("7", "-17"));
    EXPECT_EQ(echoed("3000000000"), valueChange("7", "3000000000"));
    EXPECT_EQ(echoed("1.5e20"), valueChange("7", "1.5E+20"));
    EXPECT_EQ(echoed("True"), valueChange("7", "true"));
    EXPECT_EQ(echoed("false"), valueChange("7", "false"));
    EXPECT_EQ(echoed("Level"), valueChange("7", "\"Level\""));
    EXPECT_EQ(echoed("\"12\""), valueChange("7", "\"12\""));
    EXPECT_EQ(echoed("\"two  words\""), valueChange("7", "\"two  words\""));
}

TEST_F(HostCommands, TextIsEscapedByteByByte) {
    EXPECT_EQ(echoed("\"say \\\"hi\\\" \\\\ now\""),
              valueChange("7", "\"say \\\"hi\\\" \\\\ now\""));
    EXPECT_EQ(echoed("caf\xe9"), valueChange("7", "\"caf\\u00e9\""));
    EXPECT_EQ(echoed("\"a\tb\x01\x7f\xff\""), valueChange("7", "\"a\\tb\\u0001\\u007f\\u00ff\""));
}

TEST_F(HostCommands, CommandWordsIgnoreLetterCaseAndBlankLinesAreSkipped) {
    EXPECT_EQ(command("\n# a comment\n  \r\nWRITE Mem 7 1\r"),
              (Lines{valueChange("7", "1"), reply("write")}));
}

TEST_F(HostCommands, HandleTravelsAsTextToTheNode) {
    EXPECT_EQ(command("write Mem 0007 2"), (Lines{valueChange("7", "2"), reply("write")}));
    EXPECT_EQ(command("write Mem seven 2"), Lines{failure("write", 13, "Type mismatch")});
}

TEST_F(HostCommands, WriteArrayIsNotReportedBack) {
    EXPECT_EQ(command("writearray Mem 7 1 2.5 \"x y\" true"), Lines{reply("writearray")});
}

TEST_F(HostCommands, UnknownNodeIsObjectNotSet) {
    for (const char* line : {"add Nope 1 A", "remove Nope 1", "read Nope 1", "write Nope 1 2",
                             "writearray Nope 1 2"}) {
        const std::string name = std::string(line).substr(0, std::string(line).find(' '));
        EXPECT_EQ(command(line), Lines{failure(name, 91, kNotSet)}) << line;
    }
}

TEST_F(HostCommands, MalformedLinesAreInvalidArguments) {
    const std::pair<const char*, const char*> cases[] = {
        {"frobnicate", "frobnicate"},
        {"add Mem 8", "add"},
        {"add Mem x Level", "add"},
        {"add Mem 99999999999 Level", "add"},
        {"read Mem", "read"},
        {"read Mem 7 8", "read"},
        {"remove Mem 1.5", "remove"},
        {"write Mem 7", "write"},
        {"write Mem 7 1 2", "write"},
        {"write Mem 7 \"open", "write"},
        {"write Mem 7 \"a\"b", "write"},
        {"writearray Mem 7", "writearray"},
        {"start now", "start"},
        {"nodes all", "nodes"},
        {"sleep", "sleep"},
        {"sleep -5", "sleep"},
        {"addnode OnlyName", "addnode"},
        {"addnode N MEMTAG T slow", "addnode"},
        {"quit now", "quit"},
    };
    for (const auto& [line, name] : cases)
        EXPECT_EQ(command(line), Lines{failure(name, 5, kInvalidArgument)}) << line;
    // Still serving after all of them.
    EXPECT_EQ(command("write Mem 7 1"), (Lines{valueChange("7", "1"), reply("write")}));
}

TEST_F(HostCommands, NumberTooLargeIsOverflow) {
    EXPECT_EQ(command("write Mem 7 1e999"), Lines{failure("write", 6, "Overflow")});
}

TEST_F(HostCommands, NodesComeAndGo) {
    EXPECT_EQ(command("addnode Extra MemTag Topic 250 3"), Lines{reply("addnode")});
    EXPECT_EQ(command("addnode extra MEMTAG"),
              Lines{failure("addnode", 457,
                            "This key is already associated with an element of this collection")});
    EXPECT_EQ(command("nodes"),
              Lines{reply("nodes",
                          "\"ok\":true,\"nodes\":[{\"name\":\"Mem\",\"driver\":\"MEMTAG\"},"
                          "{\"name\":\"Extra\",\"driver\":\"MemTag\"}]")});
    EXPECT_EQ(command("removenode Mem"), Lines{reply("removenode")});
    EXPECT_EQ(command("removenode Mem"), Lines{failure("removenode", 5, kInvalidArgument)});
    EXPECT_EQ(command("write Mem 7 1"), Lines{failure("write", 91, kNotSet)});
    EXPECT_EQ(command("removeall"), Lines{reply("removeall")});
    EXPECT_EQ(command("nodes"), Lines{reply("nodes", "\"ok\":true,\"nodes\":[]")});
}

TEST_F(HostCommands, SleepAndScanningAreAnswered) {
    EXPECT_EQ(command("start"), Lines{reply("start")});
    EXPECT_EQ(command("sleep 20"), Lines{reply("sleep")});
    EXPECT_EQ(command("stop"), Lines{reply("stop")});
}

TEST_F(HostCommands, CommandsQueuedBehindASleepRunInOrder) {
    cli_->send("sleep 50\nwrite Mem 7 1\nwrite Mem 7 2\n");
    EXPECT_EQ(cli_->untilReply(), Lines{reply("sleep")});
    EXPECT_EQ(cli_->untilReply(), (Lines{valueChange("7", "1"), reply("write")}));
    EXPECT_EQ(cli_->untilReply(), (Lines{valueChange("7", "2"), reply("write")}));
}

TEST_F(HostCommands, QuitEndsTheCommandAndIgnoresTheRest) {
    cli_->send("quit\nwrite Mem 7 1\n");
    Lines rest;
    EXPECT_EQ(cli_->finish(&rest), 0);
    EXPECT_EQ(rest, Lines{reply("quit")});
}

TEST_F(HostCommands, EndOfInputRunsTheLastLineThenQuits) {
    cli_->send("write Mem 7 5");  // no newline
    Lines rest;
    EXPECT_EQ(cli_->finish(&rest), 0);
    EXPECT_EQ(rest, (Lines{valueChange("7", "5"), reply("write"), reply("quit")}));
}

// ---- Readable output ------------------------------------------------------------------------

using HostText = HostFixture;

TEST_F(HostText, EventsAndRepliesAreReadableLines) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');");
    const auto r = RunCli(runArgs({}),
                          "add Mem 7 Level\nwrite Mem 7 2.5\nwrite Mem 7 \"a \\\"b\\\"\"\n"
                          "write Mem 7 TRUE\nwrite Nope 7 1\nbogus\nnodes\n");
    EXPECT_EQ(r.lines, (Lines{
                           "load: ok",
                           "add: ok",
                           "ValueChange  7 = 2.5",
                           "write: ok",
                           "ValueChange  7 = \"a \\\"b\\\"\"",
                           "write: ok",
                           "ValueChange  7 = True",
                           "write: ok",
                           "write: error 91: " + kNotSet,
                           "bogus: error 5: " + kInvalidArgument + " (unknown command)",
                           "nodes: ok: Mem (MEMTAG)",
                           "quit: ok",
                       }));
}

// ---- Disk tags ------------------------------------------------------------------------------

using HostDiskTags = HostFixture;

TEST_F(HostDiskTags, ValuesSurviveARestartOfTheCommand) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Line1', 'DISKTAG');");
    const auto first = RunCli(runArgs(), "add Line1 5 Level\nwrite Line1 5 12.5\n");
    EXPECT_EQ(first.lines, (Lines{reply("load"), reply("add"), valueChange("5", "12.5"),
                                  reply("write"), reply("quit")}));
    EXPECT_TRUE(std::filesystem::exists(driveRoot() / "NUVDiskIO" / "Line1.mdb"));

    const auto second = RunCli(runArgs(), "add Line1 5 Level\nread Line1 5\n");
    EXPECT_EQ(second.lines, (Lines{reply("load"), reply("add"), valueChange("5", "\"12.5\""),
                                   reply("read"), reply("quit")}));
}

TEST_F(HostDiskTags, UnregisteredHandleIsAnErrorReply) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Line1', 'DISKTAG');");
    const auto r = RunCli(runArgs(), "add Line1 5 Level\nwrite Line1 6 1\n");
    ASSERT_EQ(r.lines.size(), 4u);
    EXPECT_EQ(r.lines[2], failure("write", 9, "Subscript out of range"));
}

// ---- Error trapping ---------------------------------------------------------------------------

using HostTrap = HostFixture;

TEST_F(HostTrap, TrappedErrorsAreLoggedUnderTheDriveRootAndTheReplyIsOk) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');");
    const auto r = RunCli(runArgs({"--json", "--trap"}), "add Mem 7 Level\nwrite Mem seven 1\n");
    EXPECT_EQ(r.lines, (Lines{reply("load"), reply("add"), reply("write"), reply("quit")}));
    const std::string log = driveFile("MarosetErrors.txt");
    EXPECT_NE(log.find("Error #13"), std::string::npos) << log;
    EXPECT_NE(log.find("Module\\Sub: node.WriteTag"), std::string::npos) << log;
}

TEST_F(HostTrap, WithoutTrapNothingIsLogged) {
    makeProject("INSERT INTO Nodes (Name, Driver) VALUES ('Mem', 'MEMTAG');");
    const auto r = RunCli(runArgs(), "add Mem 7 Level\nwrite Mem seven 1\n");
    ASSERT_EQ(r.lines.size(), 4u);
    EXPECT_EQ(r.lines[2], failure("write", 13, "Type mismatch"));
    EXPECT_FALSE(std::filesystem::exists(driveRoot() / "MarosetErrors.txt"));
}

// ---- Command line ---------------------------------------------------------------------------

using HostUsage = HostFixture;

TEST_F(HostUsage, BadCommandLinesExitWithStatusTwo) {
    makeProject("");
    for (const auto& args : std::vector<std::vector<std::string>>{
             {"run"},
             {"run", project().string(), "extra"},
             {"run", project().string(), "--colour"},
             {"run", project().string(), "--com", "ttyUSB0"},
             {"run", project().string(), "--com", "0=/dev/ttyUSB0"},
             {"run", project().string(), "--modbus-port", "70000"},
             {"run", project().string(), "--drive-root"},
         }) {
        const auto r = RunCli(args);
        EXPECT_EQ(r.status, 2) << args.back();
        EXPECT_NE(r.errors.find("usage: maroset run"), std::string::npos) << args.back();
    }
}

TEST_F(HostUsage, HelpIsShownOnStandardOutput) {
    const auto r = RunCli({"run", "--help"});
    EXPECT_EQ(r.status, 0);
    ASSERT_FALSE(r.lines.empty());
    EXPECT_EQ(r.lines[0].rfind("usage: maroset run PROJECT", 0), 0u);
}

TEST_F(HostUsage, PortOptionsAreAccepted) {
    makeProject("");
    const auto r = RunCli(
        runArgs({"--com", "1=/dev/null", "--com=2=/dev/zero", "--modbus-port", "1502", "--json"}),
        "quit\n");
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.lines, (Lines{reply("load"), reply("quit")}));
}

}  // namespace
}  // namespace maroset::test
