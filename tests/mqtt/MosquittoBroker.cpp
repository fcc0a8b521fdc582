#include "MosquittoBroker.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <pwd.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <thread>

namespace maroset::test {

namespace {

int FreeLoopbackPort() {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in addr{};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t len = sizeof addr;
    bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof addr);
    getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &len);
    close(fd);
    return ntohs(addr.sin_port);
}

bool Accepts(int port) {
    const int fd = socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in addr{};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    addr.sin_port = htons(static_cast<uint16_t>(port));
    const bool ok = connect(fd, reinterpret_cast<sockaddr*>(&addr), sizeof addr) == 0;
    close(fd);
    return ok;
}

}  // namespace

MosquittoBroker::MosquittoBroker(const std::filesystem::path& dir, std::string user,
                                 std::string password)
    : dir_(dir), port_(FreeLoopbackPort()) {
    std::ofstream conf(dir_ / "mosquitto.conf");
    conf << "listener " << port_ << " 127.0.0.1\n";
    // Started as root, mosquitto would become user "mosquitto" and lose the temporary files.
    if (const passwd* me = getpwuid(getuid())) conf << "user " << me->pw_name << "\n";
    if (user.empty()) {
        conf << "allow_anonymous true\n";
    } else {
        const auto file = dir_ / "passwords";
        std::ofstream(file) << "";
        const std::string cmd = "mosquitto_passwd -b '" + file.string() + "' '" + user + "' '" +
                                password + "' >/dev/null 2>&1";
        if (std::system(cmd.c_str()) != 0) throw std::runtime_error("mosquitto_passwd failed");
        conf << "allow_anonymous false\npassword_file " << file.string() << "\n";
    }
}

MosquittoBroker::~MosquittoBroker() {
    if (pid_ > 0) {
        ::kill(pid_, SIGTERM);
        waitpid(pid_, nullptr, 0);
    }
}

bool MosquittoBroker::start() {
    pid_ = fork();
    if (pid_ == 0) {
        const std::string conf = (dir_ / "mosquitto.conf").string();
        const std::string log = (dir_ / "mosquitto.log").string();
        freopen(log.c_str(), "a", stderr);
        freopen(log.c_str(), "a", stdout);
        execl("/usr/sbin/mosquitto", "mosquitto", "-c", conf.c_str(), static_cast<char*>(nullptr));
        _exit(127);
    }
    for (int i = 0; i < 200; ++i) {  // up to 10 s on a busy machine
        if (Accepts(port_)) return true;
        std::this_thread::sleep_for(std::chrono::milliseconds(50));
    }
    return false;
}

void MosquittoBroker::kill() {
    if (pid_ <= 0) return;
    ::kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
    pid_ = -1;
}

}  // namespace maroset::test
