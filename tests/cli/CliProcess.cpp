#include "CliProcess.h"

#include <fcntl.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <stdexcept>

#include "support/TempDir.h"

extern char** environ;

namespace maroset::test {

namespace {

std::string ReadFile(const std::string& file) {
    std::ifstream in(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

std::vector<std::string> LinesOf(const std::string& file) {
    std::vector<std::string> lines;
    std::istringstream in(ReadFile(file));
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

}  // namespace

CliResult RunCli(const std::vector<std::string>& args, const std::string& input,
                 size_t awaitLines) {
    signal(SIGPIPE, SIG_IGN);  // a command that died must fail the test, not kill it
    TempDir scratch;
    const std::string out = scratch.path() / "out", err = scratch.path() / "err";
    int in[2];
    if (pipe2(in, O_CLOEXEC) != 0) throw std::runtime_error("pipe failed");
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, in[0], 0);
    posix_spawn_file_actions_addopen(&actions, 1, out.c_str(), O_WRONLY | O_CREAT, 0644);
    posix_spawn_file_actions_addopen(&actions, 2, err.c_str(), O_WRONLY | O_CREAT, 0644);
    std::vector<char*> raw{const_cast<char*>(MAROSET_CLI_PATH)};
    for (const auto& a : args) raw.push_back(const_cast<char*>(a.c_str()));
    raw.push_back(nullptr);
    pid_t pid = -1;
    const int rc = posix_spawn(&pid, raw[0], &actions, nullptr, raw.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    close(in[0]);
    // The inputs of the tests fit in the pipe whole.
    if (rc == 0 && !input.empty()) (void)!write(in[1], input.data(), input.size());
    for (int tick = 0; rc == 0 && tick < 3000 && LinesOf(out).size() < awaitLines; ++tick)
        usleep(10000);
    const size_t linesWhileOpen = LinesOf(out).size();
    close(in[1]);
    if (rc != 0) throw std::runtime_error(std::string("cannot start ") + MAROSET_CLI_PATH);
    int status = 0;
    for (int tick = 0; waitpid(pid, &status, WNOHANG) == 0; ++tick) {
        if (tick == 3000) kill(pid, SIGKILL);
        usleep(10000);
    }
    return {WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status), LinesOf(out),
            ReadFile(err), linesWhileOpen};
}

}  // namespace maroset::test
