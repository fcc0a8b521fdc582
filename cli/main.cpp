// The `maroset` command: a host for the library that scripts and newcomers use.
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <iostream>
#include <string>
#include <vector>

#include "cli/Demo.h"
#include "cli/HostSession.h"
#include "cli/ProjectCommands.h"
#include "cli/ServeCommand.h"
#include "cli/SimCommand.h"

namespace {

constexpr const char* kUsage =
    "usage: maroset run PROJECT [options]      serve commands on a project (see run --help)\n"
    "       maroset serve PROJECT [options]    a project as a service: HTTP API and page\n"
    "       maroset project init|add|list|tag ...  create and edit a project database\n"
    "       maroset demo [--seconds N] [--json] [--http [ADDR:PORT]]  watch a small project live\n"
    "       maroset sim KIND [options]         run one device simulator (see sim --help)\n"
    "       maroset COMMAND --help             help on one command\n";

// A standard descriptor the caller closed would be taken by the next file opened (a project
// database read as commands, say): park /dev/null on it first.
void keepStandardDescriptors() {
    for (int fd = 0; fd <= 2; ++fd) {
        if (fcntl(fd, F_GETFD) == -1 && errno == EBADF) {
            const int opened = open("/dev/null", fd == 0 ? O_RDONLY : O_WRONLY);
            if (opened != fd && opened >= 0) close(opened);  // cannot happen: lowest free fd
        }
    }
}

}  // namespace

int main(int argc, char** argv) {
    keepStandardDescriptors();
    std::vector<std::string> args(argv + 1, argv + argc);
    if (args.empty()) {
        std::cerr << kUsage;
        return 2;
    }
    const std::string command = args[0];
    args.erase(args.begin());
    if (command == "--help" || command == "-h" || command == "help") {
        std::cout << kUsage;
        return 0;
    }
    if (command == "run") return maroset::cli::HostSession::Main(args);
    if (command == "serve") return maroset::cli::ServeCommand::Main(args);
    if (command == "project") return maroset::cli::ProjectCommands::Main(args);
    if (command == "demo") return maroset::cli::Demo::Main(args);
    if (command == "sim") return maroset::cli::SimCommand::Main(args);
    std::cerr << "maroset: unknown command '" << command << "'\n" << kUsage;
    return 2;
}
