#pragma once

#include <sys/types.h>

#include <filesystem>
#include <string>

namespace maroset::test {

// Debian's mosquitto, run by a test on a free loopback port with its own configuration in a
// temporary directory; stopped (and waited for) when destroyed. kill() and start() again on
// the same port stand for a broker that crashes and comes back.
class MosquittoBroker {
  public:
    // With a user, the broker takes that user and password only.
    explicit MosquittoBroker(const std::filesystem::path& dir, std::string user = {},
                             std::string password = {});
    ~MosquittoBroker();
    MosquittoBroker(const MosquittoBroker&) = delete;
    MosquittoBroker& operator=(const MosquittoBroker&) = delete;

    int port() const { return port_; }
    std::string url() const { return "mqtt://127.0.0.1:" + std::to_string(port_); }
    // Starts it and waits (bounded) until it accepts connections; false if it does not.
    bool start();
    // SIGKILL: no goodbye to anybody.
    void kill();

  private:
    std::filesystem::path dir_;
    int port_ = 0;
    pid_t pid_ = -1;
};

}  // namespace maroset::test
