#include "platform/serial/MemorySerialCable.h"

#include <utility>

#include "lang/VbError.h"
#include "platform/serial/SerialErrors.h"

namespace maroset::platform {

struct MemorySerialCable::Line {
    EventLoop& loop;
    std::string name;
    std::shared_ptr<End> ends[2];
    std::string sent[2];
    bool cut = false;
};

class MemorySerialCable::End final : public SerialDevice, public std::enable_shared_from_this<End> {
  public:
    End(const std::shared_ptr<Line>& line, int side) : line_(line), side_(side) {}

    void listen(Handlers handlers) override {
        handlers_ = std::move(handlers);
        listening_ = true;
    }
    void stopListening() override { listening_ = false; }

    bool write(std::string_view bytes) override {
        const auto line = line_.lock();
        if (!line || line->cut)
            throw VbError(err::CommDeviceNotOpen, "Serial device " + name() + " is gone");
        line->sent[side_].append(bytes);
        std::weak_ptr<End> peer = line->ends[1 - side_];
        line->loop.post([peer, data = std::string(bytes)] {
            if (auto end = peer.lock()) end->deliver(data);
        });
        return true;
    }

    std::string name() const override {
        const auto line = line_.lock();
        return line ? line->name : "memory cable";
    }

    void deliver(const std::string& data) {
        const auto line = line_.lock();
        if (!line || line->cut || !listening_) return;
        // A copy: the handler may drop this end, and its handlers with it.
        if (const auto received = handlers_.received) received(data);
    }

    void breakLine(const std::string& why) {
        if (!listening_) return;
        listening_ = false;
        if (const auto broken = handlers_.broken) broken(why);
    }

  private:
    std::weak_ptr<Line> line_;
    int side_;
    Handlers handlers_;
    bool listening_ = false;
};

MemorySerialCable::MemorySerialCable(EventLoop& loop, std::string name)
    : line_(std::make_shared<Line>(Line{loop, std::move(name), {}, {}, false})) {
    line_->ends[0] = std::make_shared<End>(line_, 0);
    line_->ends[1] = std::make_shared<End>(line_, 1);
}

MemorySerialCable::~MemorySerialCable() = default;

std::shared_ptr<SerialDevice> MemorySerialCable::hostEnd() const {
    return line_->ends[0];
}

std::shared_ptr<SerialDevice> MemorySerialCable::deviceEnd() const {
    return line_->ends[1];
}

const std::string& MemorySerialCable::hostSent() const {
    return line_->sent[0];
}

std::string MemorySerialCable::takeHostSent() {
    return std::exchange(line_->sent[0], {});
}

const std::string& MemorySerialCable::deviceSent() const {
    return line_->sent[1];
}

std::string MemorySerialCable::takeDeviceSent() {
    return std::exchange(line_->sent[1], {});
}

void MemorySerialCable::cut(const std::string& why) {
    if (line_->cut) return;
    line_->cut = true;
    // Keep the ends alive while their handlers run: a handler may drop its device.
    const auto host = line_->ends[0];
    const auto device = line_->ends[1];
    host->breakLine(why);
    device->breakLine(why);
}

}  // namespace maroset::platform
