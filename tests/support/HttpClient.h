#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

#include "platform/EventLoop.h"

namespace maroset::test {

// A very small HTTP/1.1 client on a plain loopback socket, for a server that runs on the
// same thread's loop: every wait runs the loop, and gives up after a bounded time.
class HttpClient {
  public:
    struct Response {
        int status = 0;  // 0: no complete answer in time
        std::string headers;
        std::string body;
    };

    HttpClient(platform::EventLoop& loop, uint16_t port) : loop_(loop), port_(port) {}

    // One request on its own connection ("Connection: close"); the answer read to its end.
    Response request(const std::string& method, const std::string& path,
                     const std::string& body = "", const std::vector<std::string>& headers = {});

    // An open GET whose answer keeps coming (an event stream).
    class Stream {
      public:
        Stream(HttpClient& client, const std::string& path);
        ~Stream();
        Stream(const Stream&) = delete;
        Stream& operator=(const Stream&) = delete;
        // Runs the loop and reads until received() holds text, or the time is up.
        bool waitFor(const std::string& text,
                     std::chrono::milliseconds limit = std::chrono::milliseconds(3000));
        // Everything received so far, headers included.
        const std::string& received() const { return received_; }
        // Whether the server closed the connection.
        bool closed() const { return closed_; }

      private:
        void drain();

        HttpClient& client_;
        int fd_;
        std::string received_;
        bool closed_ = false;
    };

    // Runs the loop until done() holds or the time is up; done()'s last answer.
    bool runUntil(const std::function<bool()>& done,
                  std::chrono::milliseconds limit = std::chrono::milliseconds(3000));

  private:
    friend class Stream;
    int connectAndSend(const std::string& text);

    platform::EventLoop& loop_;
    uint16_t port_;
};

}  // namespace maroset::test
