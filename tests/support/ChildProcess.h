#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace maroset::test {

// A program the test starts, its standard input and output on pipes, its standard error the
// test's own. Every wait has a time limit, so a child that hangs fails the test instead of
// blocking it; the destructor kills a child that still runs.
class ChildProcess {
  public:
    // argv[0] is the program's path; std::runtime_error when it cannot start.
    explicit ChildProcess(const std::vector<std::string>& argv);
    ~ChildProcess();
    ChildProcess(const ChildProcess&) = delete;
    ChildProcess& operator=(const ChildProcess&) = delete;

    // The next line of standard output, or nothing when none comes within `limit`.
    std::optional<std::string> readLine(std::chrono::milliseconds limit);
    void write(std::string_view text);
    void signal(int number);
    // The exit status (128 + signal when killed), or nothing while it still runs.
    std::optional<int> wait(std::chrono::milliseconds limit);

  private:
    int pid_ = -1;
    int input_ = -1;
    int output_ = -1;
    std::string pending_;
    std::optional<int> status_;
};

}  // namespace maroset::test
