#pragma once

#include <sys/types.h>

#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "support/TempDir.h"

namespace maroset::test {

// The built `maroset` command run as a child process: its standard input is a pipe the test
// writes to, its standard output a pipe read line by line, its standard error a file read at
// the end. Reads give up after a generous time, so a command that hangs fails the test
// instead of blocking it.
class CliProcess {
  public:
    explicit CliProcess(const std::vector<std::string>& args);
    ~CliProcess();
    CliProcess(const CliProcess&) = delete;
    CliProcess& operator=(const CliProcess&) = delete;

    void send(const std::string& text);
    void closeInput();
    // The next line of standard output without its newline; nothing at the end of output.
    std::optional<std::string> readLine();
    // Lines up to and including the next line that is a reply (JSON or readable).
    std::vector<std::string> untilReply();
    // Sends one command line and returns what it printed, reply last.
    std::vector<std::string> command(const std::string& line);
    // Closes input, reads the rest of the output and waits: the exit status.
    int finish(std::vector<std::string>* rest = nullptr);
    std::string errorOutput() const;

  private:
    TempDir scratch_;
    pid_t pid_ = -1;
    int in_ = -1;
    int out_ = -1;
    std::string buffer_;
    bool eof_ = false;
    std::optional<int> status_;
};

struct CliResult {
    int status;
    std::vector<std::string> lines;
    std::string errors;
};

// Runs the command with the whole input at once and collects everything.
CliResult RunCli(const std::vector<std::string>& args, const std::string& input = "");

}  // namespace maroset::test
