#include "support/HttpClient.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <stdexcept>

namespace maroset::test {

using namespace std::chrono_literals;

namespace {

// Appends what the socket holds now; true once the peer has closed (or the socket failed).
bool readAvailable(int fd, std::string& into) {
    char buffer[65536];
    for (;;) {
        const ssize_t n = ::recv(fd, buffer, sizeof buffer, 0);
        if (n > 0) {
            into.append(buffer, static_cast<size_t>(n));
            continue;
        }
        return n == 0 || errno != EAGAIN;
    }
}

}  // namespace

bool HttpClient::runUntil(const std::function<bool()>& done, std::chrono::milliseconds limit) {
    const auto deadline = loop_.now() + limit;
    while (!done() && loop_.now() < deadline) loop_.runFor(2ms);
    return done();
}

int HttpClient::connectAndSend(const std::string& text) {
    const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (fd < 0) throw std::runtime_error("socket");
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(port_);
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    // Loopback connects complete at once (the kernel accepts on the listener's behalf).
    if (::connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) != 0) {
        ::close(fd);
        throw std::runtime_error("connect");
    }
    ::fcntl(fd, F_SETFL, O_NONBLOCK);
    size_t sent = 0;
    runUntil([&] {
        const ssize_t n = ::send(fd, text.data() + sent, text.size() - sent, MSG_NOSIGNAL);
        if (n > 0)
            sent += static_cast<size_t>(n);
        else if (n < 0 && errno != EAGAIN)
            return true;  // the server closed: read its answer
        return sent == text.size();
    });
    return fd;
}

HttpClient::Response HttpClient::request(const std::string& method, const std::string& path,
                                         const std::string& body,
                                         const std::vector<std::string>& headers) {
    std::string text =
        method + " " + path + " HTTP/1.1\r\nHost: 127.0.0.1\r\nConnection: close\r\n";
    for (const auto& h : headers) text += h + "\r\n";
    if (!body.empty() || method == "POST")
        text += "Content-Length: " + std::to_string(body.size()) + "\r\n";
    text += "\r\n" + body;
    const int fd = connectAndSend(text);
    std::string raw;
    const bool closed = runUntil([&] { return readAvailable(fd, raw); });
    ::close(fd);
    Response r;
    const auto end = raw.find("\r\n\r\n");
    if (!closed || end == std::string::npos || raw.compare(0, 9, "HTTP/1.1 ") != 0) return r;
    r.status = std::stoi(raw.substr(9, 3));
    r.headers = raw.substr(0, end);
    r.body = raw.substr(end + 4);
    return r;
}

HttpClient::Stream::Stream(HttpClient& client, const std::string& path)
    : client_(client),
      fd_(client.connectAndSend("GET " + path + " HTTP/1.1\r\nHost: 127.0.0.1\r\n\r\n")) {}

HttpClient::Stream::~Stream() {
    ::close(fd_);
}

void HttpClient::Stream::drain() {
    if (!closed_) closed_ = readAvailable(fd_, received_);
}

bool HttpClient::Stream::waitFor(const std::string& text, std::chrono::milliseconds limit) {
    return client_.runUntil(
        [&] {
            drain();
            return received_.find(text) != std::string::npos;
        },
        limit);
}

}  // namespace maroset::test
