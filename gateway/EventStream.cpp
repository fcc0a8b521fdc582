#include "gateway/EventStream.h"

#include <algorithm>
#include <cstring>

namespace maroset::gateway {

size_t EventStream::Client::read(char* out, size_t max) {
    const size_t n = std::min(max, backlog_.size() - offset_);
    std::memcpy(out, backlog_.data() + offset_, n);
    offset_ += n;
    if (offset_ == backlog_.size()) {
        backlog_.clear();
        offset_ = 0;
    }
    return n;
}

void EventStream::Client::append(std::string_view bytes) {
    if (dropped_) return;
    if (backlog_.size() - offset_ + bytes.size() > MaxBacklog) {
        drop();
        return;
    }
    const bool wasEmpty = backlog_.size() == offset_;
    backlog_.append(bytes);
    if (wasEmpty && ready) ready();
}

void EventStream::Client::drop() {
    dropped_ = true;
    backlog_.clear();
    backlog_.shrink_to_fit();
    offset_ = 0;
    if (ready) ready();
}

EventStream::EventStream(platform::EventLoop& loop, ReportTap& reports, LinkStatusBoard& links,
                         const platform::Clock& clock)
    : loop_(loop), clock_(clock) {
    valuesTap_ = reports.Values.subscribe(
        [this](std::string_view node, const VbArray<int32_t>& handles, int16_t count,
               const VbArray<Variant>& v) { values(node, handles, count, v); });
    errorsTap_ =
        reports.Errors.subscribe([this](std::string_view, const std::string& driver,
                                        const std::string& from, const std::string& message) {
            if (clients() == 0) return;
            JsonWriter j;
            j.beginObject().key("driver").string(driver).key("from").string(from);
            j.key("message").string(message).endObject();
            send("event: error\ndata: " + j.str() + "\n\n");
        });
    linkChanges_ = links.StateChanged.subscribe([this](const LinkStatus& status) {
        if (clients() == 0) return;
        JsonWriter j;
        j.beginObject().key("node").string(status.node);
        j.key("state").string(LinkStateName(status.state)).endObject();
        send("event: link\ndata: " + j.str() + "\n\n");
    });
}

EventStream::~EventStream() {
    if (keepAlive_) loop_.cancel(*keepAlive_);
    dropAll();
}

std::shared_ptr<EventStream::Client> EventStream::connect() {
    auto client = std::make_shared<Client>();
    // A first line, so the client sees the stream open before any event.
    client->append(": maroset events\n\n");
    clients_.push_back(client);
    if (!keepAlive_) keepAlive_ = loop_.schedule(KeepAlive, [this] { keepAlive(); });
    return client;
}

size_t EventStream::clients() {
    std::erase_if(clients_, [](const std::weak_ptr<Client>& c) {
        const auto client = c.lock();
        return !client || client->dropped();
    });
    return clients_.size();
}

void EventStream::dropAll() {
    for (const auto& c : clients_) {
        if (const auto client = c.lock()) client->drop();
    }
    clients_.clear();
}

void EventStream::keepAlive() {
    keepAlive_.reset();
    if (clients() == 0) return;
    send(": keep-alive\n\n");
    keepAlive_ = loop_.schedule(KeepAlive, [this] { keepAlive(); });
}

void EventStream::values(std::string_view node, const VbArray<int32_t>& handles, int16_t count,
                         const VbArray<Variant>& v) {
    if (clients_.empty()) return;
    if (!batch_) {
        batch_.emplace().beginArray();
        loop_.post([this] { flushValues(); });
    }
    const int32_t n = std::min({int32_t{count}, handles.size(), v.size()});
    // One time for the whole report (its values arrived together); the node's name and the
    // time are written once and reused while they stay the same, as they do within a scan.
    const platform::DateTime now = clock_.now();
    if (now != stampTime_ || stampJson_.empty()) {
        JsonWriter stamp;
        stamp.time(now);
        stampTime_ = now;
        stampJson_ = stamp.str();
    }
    if (node != stampNode_ || nodeJson_.empty()) {
        stampNode_ = node;
        nodeJson_ = JsonWriter::Quote(node);
    }
    JsonWriter& j = *batch_;
    for (int32_t i = 0; i < n; ++i) {
        j.beginObject().key("node").raw(nodeJson_);
        j.key("handle").integer(handles(handles.LBound() + i));
        j.key("value").value(v(v.LBound() + i)).key("time").raw(stampJson_).endObject();
    }
}

void EventStream::flushValues() {
    if (!batch_) return;
    batch_->endArray();
    std::string event = "event: values\ndata: ";
    event += batch_->str();
    event += "\n\n";
    batch_.reset();
    send(event);
}

void EventStream::send(std::string_view bytes) {
    // A client's ready handler may resume its connection, never call back in here.
    for (const auto& c : clients_) {
        if (const auto client = c.lock()) client->append(bytes);
    }
}

}  // namespace maroset::gateway
