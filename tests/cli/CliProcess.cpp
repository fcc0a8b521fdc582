#include "CliProcess.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <utility>

extern char** environ;

namespace maroset::test {

namespace {

constexpr int kReadTimeoutMs = 30000;

bool isReply(const std::string& line) {
    // JSON replies start with "reply"; readable ones are "name: ok..." or "name: error ...".
    if (line.rfind("{\"reply\":", 0) == 0) return true;
    if (line.rfind("{", 0) == 0) return false;
    if (line.rfind("ValueChange ", 0) == 0 || line.rfind("DriverError ", 0) == 0) return false;
    return line.find(": ok") != std::string::npos || line.find(": error ") != std::string::npos;
}

}  // namespace

CliProcess::CliProcess(const std::vector<std::string>& args) {
    signal(SIGPIPE, SIG_IGN);  // a command that died must fail the test, not kill it
    int inPipe[2], outPipe[2];
    if (pipe2(inPipe, O_CLOEXEC) != 0 || pipe2(outPipe, O_CLOEXEC) != 0)
        throw std::runtime_error("pipe failed");
    const std::string errFile = (scratch_.path() / "stderr").string();

    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, inPipe[0], 0);
    posix_spawn_file_actions_adddup2(&actions, outPipe[1], 1);
    posix_spawn_file_actions_addopen(&actions, 2, errFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC,
                                     0644);
    std::vector<std::string> argv{MAROSET_CLI_PATH};
    argv.insert(argv.end(), args.begin(), args.end());
    std::vector<char*> raw;
    for (auto& a : argv) raw.push_back(a.data());
    raw.push_back(nullptr);
    const int rc = posix_spawn(&pid_, raw[0], &actions, nullptr, raw.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    close(inPipe[0]);
    close(outPipe[1]);
    in_ = inPipe[1];
    out_ = outPipe[0];
    if (rc != 0) throw std::runtime_error(std::string("cannot start ") + MAROSET_CLI_PATH);
}

CliProcess::~CliProcess() {
    if (in_ >= 0) close(in_);
    if (out_ >= 0) close(out_);
    if (pid_ > 0 && !status_) {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
}

void CliProcess::send(const std::string& text) {
    size_t done = 0;
    while (done < text.size()) {
        const ssize_t n = write(in_, text.data() + done, text.size() - done);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) throw std::runtime_error("the command stopped reading its input");
        done += static_cast<size_t>(n);
    }
}

void CliProcess::closeInput() {
    if (in_ >= 0) close(in_);
    in_ = -1;
}

std::optional<std::string> CliProcess::readLine() {
    for (;;) {
        if (const auto nl = buffer_.find('\n'); nl != std::string::npos) {
            std::string line = buffer_.substr(0, nl);
            buffer_.erase(0, nl + 1);
            return line;
        }
        if (eof_) {
            if (buffer_.empty()) return std::nullopt;
            return std::exchange(buffer_, {});
        }
        pollfd p{out_, POLLIN, 0};
        const int ready = poll(&p, 1, kReadTimeoutMs);
        if (ready == 0) throw std::runtime_error("no output from the command in time");
        if (ready < 0 && errno == EINTR) continue;
        char chunk[4096];
        const ssize_t n = read(out_, chunk, sizeof chunk);
        if (n < 0 && errno == EINTR) continue;
        if (n <= 0) {
            eof_ = true;
            continue;
        }
        buffer_.append(chunk, static_cast<size_t>(n));
    }
}

std::vector<std::string> CliProcess::untilReply() {
    std::vector<std::string> lines;
    while (auto line = readLine()) {
        lines.push_back(*line);
        if (isReply(*line)) break;
    }
    return lines;
}

std::vector<std::string> CliProcess::command(const std::string& line) {
    send(line + "\n");
    return untilReply();
}

int CliProcess::finish(std::vector<std::string>* rest) {
    closeInput();
    while (auto line = readLine()) {
        if (rest) rest->push_back(*line);
    }
    int status = 0;
    while (waitpid(pid_, &status, 0) < 0 && errno == EINTR) {
    }
    status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return *status_;
}

std::string CliProcess::errorOutput() const {
    std::ifstream in(scratch_.path() / "stderr", std::ios::binary);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

CliResult RunCli(const std::vector<std::string>& args, const std::string& input) {
    CliProcess process(args);
    if (!input.empty()) process.send(input);
    CliResult result{};
    result.status = process.finish(&result.lines);
    result.errors = process.errorOutput();
    return result;
}

}  // namespace maroset::test
