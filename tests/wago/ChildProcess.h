#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "support/TempDir.h"

namespace maroset::test {

// A program the test starts, with its standard input and output on pipes and its standard
// error in a file. Every wait has a time limit, so a child that hangs fails the test instead
// of blocking it. The destructor kills a child that is still running.
class ChildProcess {
  public:
    // argv[0] is the program's path. Fails with std::runtime_error when it cannot start.
    explicit ChildProcess(const std::vector<std::string>& argv);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // The next line of standard output (without its newline), or nothing when none comes
    // within `limit` or the output ended.
    std::optional<std::string> readLine(std::chrono::milliseconds limit);
    void write(std::string_view text);
    void closeInput();
    void signal(int number);
    // The exit status (128 + signal when killed), or nothing while it still runs after `limit`.
    std::optional<int> wait(std::chrono::milliseconds limit);
    // Standard error so far.
    std::string errors() const;

  private:
    TempDir scratch_;
    int pid_ = -1;
    int input_ = -1;
    int output_ = -1;
    std::string pending_;
    std::optional<int> status_;
};

}  // namespace maroset::test
