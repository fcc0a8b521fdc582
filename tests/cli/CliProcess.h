#pragma once

#include <string>
#include <vector>

namespace maroset::test {

struct CliResult {
    int status;
    std::vector<std::string> lines;
    std::string errors;
    // Lines of standard output written while the input was still open.
    size_t linesWhileOpen;
};

// Runs the built `maroset` command with `input` on a pipe as standard input and collects its
// exit status and output. With `awaitLines`, the input stays open until standard output holds
// that many lines. Waits give up after 30 s, so a command that hangs fails the test instead of
// blocking it.
CliResult RunCli(const std::vector<std::string>& args, const std::string& input = "",
                 size_t awaitLines = 0);

}  // namespace maroset::test
