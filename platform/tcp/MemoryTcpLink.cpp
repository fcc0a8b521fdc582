#include "platform/tcp/MemoryTcpLink.h"

#include <deque>
#include <utility>

#include "platform/tcp/TcpErrors.h"

namespace maroset::platform {

namespace {
constexpr int kClient = 0;
constexpr int kServer = 1;
constexpr const char* kClientAddress = "127.0.0.1";
}  // namespace

struct MemoryTcpLink::Line {
    EventLoop& loop;
    std::string serverAddress;
    int32_t serverPort;
    std::weak_ptr<End> ends[2];
    std::string sent[2];
    bool open = true;
};

class MemoryTcpLink::End final : public TcpStream, public std::enable_shared_from_this<End> {
  public:
    enum class Kind { Connected, Data, Closed, Failed };
    struct Item {
        Kind kind;
        std::string data;
        int32_t number = 0;
    };

    End(std::shared_ptr<Line> line, int side, bool connected)
        : line_(std::move(line)), side_(side), connected_(connected) {}

    void listen(Handlers handlers) override {
        handlers_ = std::move(handlers);
        listening_ = true;
        if (!inbox_.empty()) scheduleDrain();
    }

    void write(std::string_view bytes) override {
        if (done_ || !connected_ || !line_->open || bytes.empty()) return;
        line_->sent[side_].append(bytes);
        if (const auto peer = line_->ends[1 - side_].lock())
            peer->enqueue({Kind::Data, std::string(bytes)});
    }

    void close() override {
        if (done_) return;
        done_ = true;
        handlers_ = {};
        inbox_.clear();
        if (!line_->open) return;
        line_->open = false;
        if (const auto peer = line_->ends[1 - side_].lock()) peer->enqueue({Kind::Closed, {}});
    }

    std::string peerAddress() const override {
        if (side_ == kServer) return kClientAddress;
        return connected_ ? line_->serverAddress : std::string();
    }
    int32_t peerPort() const override {
        if (side_ == kServer) return 0;
        return connected_ ? line_->serverPort : 0;
    }

    void enqueue(Item item) {
        if (done_) return;
        inbox_.push_back(std::move(item));
        scheduleDrain();
    }

  private:
    void scheduleDrain() {
        if (drainPosted_) return;
        drainPosted_ = true;
        line_->loop.post([weak = weak_from_this()] {
            if (const auto self = weak.lock()) self->drain();
        });
    }

    // Delivers what waits, one item at a time. A drain that finds the previous delivery's
    // handler still on the stack (it pumped the loop) leaves the rest to that delivery's loop.
    void drain() {
        drainPosted_ = false;
        if (delivering_ || !listening_) return;
        const auto self = shared_from_this();
        delivering_ = true;
        while (!inbox_.empty() && !done_ && listening_) {
            Item item = std::move(inbox_.front());
            inbox_.pop_front();
            deliver(item);
        }
        delivering_ = false;
    }

    void deliver(const Item& item) {
        switch (item.kind) {
            case Kind::Connected:
                connected_ = true;
                if (const auto connected = handlers_.connected) connected();
                return;
            case Kind::Data:
                if (const auto received = handlers_.received) received(item.data);
                return;
            case Kind::Closed:
                done_ = true;
                inbox_.clear();
                if (const auto closed = handlers_.closed) closed();
                return;
            case Kind::Failed:
                done_ = true;
                inbox_.clear();
                if (const auto failed = handlers_.failed)
                    failed(item.number, sck::Description(item.number));
                return;
        }
    }

    std::shared_ptr<Line> line_;
    int side_;
    bool connected_;
    Handlers handlers_;
    std::deque<Item> inbox_;
    bool listening_ = false;
    bool drainPosted_ = false;
    bool delivering_ = false;
    bool done_ = false;
};

MemoryTcpLink::MemoryTcpLink(EventLoop& loop, std::string serverAddress, int32_t serverPort)
    : line_(
          std::make_shared<Line>(Line{loop, std::move(serverAddress), serverPort, {}, {}, true})) {
    ends_[kClient] = std::make_shared<End>(line_, kClient, false);
    ends_[kServer] = std::make_shared<End>(line_, kServer, true);
    line_->ends[kClient] = ends_[kClient];
    line_->ends[kServer] = ends_[kServer];
}

MemoryTcpLink::~MemoryTcpLink() = default;

std::shared_ptr<TcpStream> MemoryTcpLink::clientEnd() const {
    return ends_[kClient];
}

std::shared_ptr<TcpStream> MemoryTcpLink::serverEnd() const {
    return ends_[kServer];
}

const std::string& MemoryTcpLink::clientSent() const {
    return line_->sent[kClient];
}

std::string MemoryTcpLink::takeClientSent() {
    return std::exchange(line_->sent[kClient], {});
}

const std::string& MemoryTcpLink::serverSent() const {
    return line_->sent[kServer];
}

std::string MemoryTcpLink::takeServerSent() {
    return std::exchange(line_->sent[kServer], {});
}

void MemoryTcpLink::reset() {
    if (!line_->open) return;
    line_->open = false;
    for (const auto& end : ends_) end->enqueue({End::Kind::Failed, {}, sck::ConnectionReset});
}

bool MemoryTcpLink::open() const {
    return line_->open;
}

void MemoryTcpLink::accepted() {
    ends_[kClient]->enqueue({End::Kind::Connected, {}});
}

void MemoryTcpLink::refused(int32_t number) {
    line_->open = false;
    ends_[kClient]->enqueue({End::Kind::Failed, {}, number});
}

}  // namespace maroset::platform
