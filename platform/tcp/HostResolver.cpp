#include "platform/tcp/HostResolver.h"

#include <arpa/inet.h>
#include <netdb.h>
#include <netinet/in.h>
#include <sys/eventfd.h>
#include <unistd.h>

#include <cstring>
#include <mutex>
#include <optional>
#include <system_error>
#include <thread>

#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

namespace {

// What the helper thread and the loop share. The thread holds it until it has answered, the
// lookup until it is cancelled or done; the last one frees it.
struct Job {
    explicit Job(std::string h, int32_t p) : host(std::move(h)), port(p) {
        fd = ::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    }
    ~Job() {
        if (fd >= 0) ::close(fd);
    }
    const std::string host;
    const int32_t port;
    int fd = -1;
    std::mutex mutex;
    bool answered = false;
    int32_t error = 0;
    HostResolver::Address address;

    void run() {
        addrinfo hints{};
        hints.ai_family = AF_UNSPEC;
        hints.ai_socktype = SOCK_STREAM;
        hints.ai_flags = AI_ADDRCONFIG;
        addrinfo* list = nullptr;
        const std::string service = std::to_string(port);
        const int rc = ::getaddrinfo(host.c_str(), service.c_str(), &hints, &list);
        {
            std::lock_guard<std::mutex> lock(mutex);
            if (rc != 0 || !list) {
                error = sck::FromResolver(rc == 0 ? EAI_NONAME : rc);
            } else {
                std::memcpy(&address.storage, list->ai_addr, list->ai_addrlen);
                address.length = list->ai_addrlen;
            }
            answered = true;
        }
        if (list) ::freeaddrinfo(list);
        const uint64_t one = 1;
        [[maybe_unused]] const ssize_t n = ::write(fd, &one, sizeof one);
    }
};

class ThreadLookup final : public HostResolver::Lookup {
  public:
    ThreadLookup(EventLoop& loop, std::shared_ptr<Job> job, HostResolver::Done done)
        : loop_(loop), job_(std::move(job)), done_(std::move(done)) {
        watch_ = loop_.watch(job_->fd, EventLoop::Readable, [this](short) { answer(); });
    }
    ~ThreadLookup() override {
        if (watch_) loop_.unwatch(*watch_);
    }

  private:
    void answer() {
        int32_t error;
        HostResolver::Address address;
        {
            std::lock_guard<std::mutex> lock(job_->mutex);
            if (!job_->answered) return;
            error = job_->error;
            address = job_->address;
        }
        loop_.unwatch(*watch_);
        watch_.reset();
        // Last: the callback may destroy this lookup.
        const HostResolver::Done done = std::move(done_);
        done(error, address);
    }

    EventLoop& loop_;
    std::shared_ptr<Job> job_;
    HostResolver::Done done_;
    std::optional<EventLoop::WatchId> watch_;
};

// A lookup that failed before it started (no eventfd, no thread): answers at the next turn.
class FailedLookup final : public HostResolver::Lookup {
  public:
    FailedLookup(EventLoop& loop, HostResolver::Done done) : alive_(std::make_shared<bool>(true)) {
        loop.post([alive = std::weak_ptr<bool>(alive_), done = std::move(done)] {
            if (alive.lock()) done(sck::NonRecoverableError, HostResolver::Address{});
        });
    }

  private:
    std::shared_ptr<bool> alive_;
};

}  // namespace

std::unique_ptr<HostResolver::Lookup> HostResolver::Resolve(EventLoop& loop,
                                                            const std::string& host, int32_t port,
                                                            Done done) {
    auto job = std::make_shared<Job>(host, port);
    if (job->fd < 0) return std::make_unique<FailedLookup>(loop, std::move(done));
    try {
        std::thread([job] { job->run(); }).detach();
    } catch (const std::system_error&) {
        return std::make_unique<FailedLookup>(loop, std::move(done));
    }
    // The answer waits in the eventfd until the loop looks, so watching after the thread has
    // started loses nothing.
    return std::make_unique<ThreadLookup>(loop, std::move(job), std::move(done));
}

bool HostResolver::Numeric(const std::string& host, int32_t port, Address& out) {
    out = Address{};
    auto* v4 = reinterpret_cast<sockaddr_in*>(&out.storage);
    if (::inet_pton(AF_INET, host.c_str(), &v4->sin_addr) == 1) {
        v4->sin_family = AF_INET;
        v4->sin_port = htons(static_cast<uint16_t>(port));
        out.length = sizeof(sockaddr_in);
        return true;
    }
    out = Address{};
    auto* v6 = reinterpret_cast<sockaddr_in6*>(&out.storage);
    if (::inet_pton(AF_INET6, host.c_str(), &v6->sin6_addr) == 1) {
        v6->sin6_family = AF_INET6;
        v6->sin6_port = htons(static_cast<uint16_t>(port));
        out.length = sizeof(sockaddr_in6);
        return true;
    }
    return false;
}

bool HostResolver::IsNumeric(const std::string& host) {
    Address ignored;
    return Numeric(host, 0, ignored);
}

}  // namespace maroset::platform
