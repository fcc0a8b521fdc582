#include "sim/softplc/SoftPlcSimulator.h"

#include <algorithm>
#include <charconv>
#include <deque>
#include <sstream>

#include "core/Runtime.h"
#include "sim/softplc/ServerFrames.h"

namespace maroset::sim {

namespace {

constexpr int32_t kResendMs = 500;
constexpr size_t kReceivedKept = 1000;

platform::EventLoop& loop() {
    return Runtime::current().loop();
}

std::vector<std::string> fieldsOf(const std::string& data) {
    std::vector<std::string> out;
    size_t start = 0;
    for (size_t at; (at = data.find(";~", start)) != std::string::npos; start = at + 2)
        out.push_back(data.substr(start, at - start));
    out.push_back(data.substr(start));
    return out;
}

std::optional<int64_t> wholeNumber(std::string_view s) {
    while (!s.empty() && s.front() == ' ') s.remove_prefix(1);
    while (!s.empty() && s.back() == ' ') s.remove_suffix(1);
    int64_t n = 0;
    const auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), n);
    if (ec != std::errc() || end != s.data() + s.size() || s.empty()) return std::nullopt;
    return n;
}

std::optional<double> decimalNumber(const std::string& s) {
    if (s.empty()) return std::nullopt;
    try {
        size_t used = 0;
        const double d = std::stod(s, &used);
        if (used != s.size()) return std::nullopt;
        return d;
    } catch (const std::exception&) {
        return std::nullopt;
    }
}

std::string decimalText(double d) {
    std::ostringstream out;
    out << d;
    return out.str();
}

}  // namespace

// One client connection: its own message numbers, its unacknowledged frames, its
// subscription.
class SoftPlcSimulator::Session : public std::enable_shared_from_this<Session> {
  public:
    struct Pending {
        std::string frame;
        int32_t number;
        int32_t ticks = 0;
        int32_t tries = 0;
    };

    Session(SoftPlcSimulator& server, std::shared_ptr<platform::TcpStream> stream)
        : server_(server), stream_(std::move(stream)), resend_(loop()) {
        resend_.Interval(kResendMs);
    }

    void start() {
        const std::weak_ptr<Session> weak = weak_from_this();
        stream_->listen({{},
                         {},
                         [weak](std::string_view bytes) {
                             if (const auto self = weak.lock()) self->onBytes(bytes);
                         },
                         [weak] {
                             if (const auto self = weak.lock()) self->ended();
                         },
                         [weak](int32_t, const std::string&) {
                             if (const auto self = weak.lock()) self->ended();
                         }});
        tick_ = resend_.Tick.subscribe([weak] {
            if (const auto self = weak.lock()) self->onTick();
        });
    }

    // Builds and sends one frame with the next number; data frames wait for their ACK.
    void send(const std::string& type, const std::string& data) {
        if (!open_) return;
        number_ = number_ >= 999 ? 0 : number_ + 1;
        std::string frame = ServerFrame::Write(type, number_, data);
        if (type != "ACK" && type != "NAK") {
            std::erase_if(unacked_, [&](const Pending& p) { return p.number == number_; });
            unacked_.push_back({frame, number_});
            resend_.Enabled(true);
        }
        server_.transmit(*this, std::move(frame));
    }

    void write(const std::string& bytes) {
        if (!open_) return;
        if (splitting_) {
            deferred_ += bytes;  // behind the second half of a split frame
            return;
        }
        stream_->write(bytes);
    }

    // Writes a frame in two pieces, the second after `gapMs`.
    void writeSplit(const std::string& frame, int32_t gapMs) {
        const size_t half = frame.size() / 2;
        write(frame.substr(0, half));
        if (gapMs <= 0) {
            write(frame.substr(half));
            return;
        }
        splitting_ = true;
        deferred_ = frame.substr(half);
        const std::weak_ptr<Session> weak = weak_from_this();
        loop().schedule(std::chrono::milliseconds(gapMs), [weak] {
            const auto self = weak.lock();
            if (!self) return;
            self->splitting_ = false;
            self->write(std::exchange(self->deferred_, {}));
        });
    }

    void close() {
        if (!open_) return;
        open_ = false;
        resend_.Enabled(false);
        stream_->close();
    }

    bool open() const { return open_; }
    std::vector<std::pair<int32_t, std::string>> subscription;
    size_t unackedCount() const { return unacked_.size(); }

  private:
    void onBytes(std::string_view bytes) {
        const auto self = shared_from_this();
        if (server_.silent_) return;
        reader_.feed(bytes);
        std::string unit;
        while (open_ && reader_.next(unit)) {
            const auto frame = ServerFrame::Read(unit);
            if (!frame) {
                send("NAK", " ");
                continue;
            }
            if (frame->type == "ACK") {
                const auto n = wholeNumber(frame->data);
                std::erase_if(unacked_, [&](const Pending& p) { return n && p.number == *n; });
            } else if (frame->type == "NAK") {
                onNak();
            } else {
                onData(*frame);
            }
        }
    }

    void onData(const ServerFrame& frame) {
        if (server_.nakNext_ > 0) {
            --server_.nakNext_;
            send("NAK", " ");
            return;
        }
        if (server_.dropAcks_ > 0) {
            --server_.dropAcks_;  // taken, but the ACK is lost
        } else {
            char digits[4];
            std::snprintf(digits, sizeof digits, "%03u",
                          static_cast<unsigned>(frame.number) % 1000u);
            send("ACK", digits);
        }
        server_.onFrame(*this, frame.type, frame.data);
    }

    void onNak() {
        while (!unacked_.empty()) {
            Pending& oldest = unacked_.front();
            if (++oldest.tries < 3) {
                oldest.ticks = 0;
                server_.transmit(*this, oldest.frame);
                return;
            }
            unacked_.pop_front();
        }
    }

    void onTick() {
        const auto self = shared_from_this();
        if (unacked_.empty()) {
            resend_.Enabled(false);
            return;
        }
        if (server_.silent_) return;
        std::deque<Pending> kept;
        std::vector<std::string> again;
        for (Pending& p : unacked_) {
            if (++p.ticks > 2) {
                p.ticks = 0;
                if (++p.tries > 3) continue;  // given up
                again.push_back(p.frame);
            }
            kept.push_back(std::move(p));
        }
        unacked_ = std::move(kept);
        for (const auto& frame : again) server_.transmit(*this, frame);
    }

    void ended() {
        open_ = false;
        resend_.Enabled(false);
        // Later: the stream may still be delivering to us.
        const std::weak_ptr<bool> alive = server_.alive_;
        SoftPlcSimulator* server = &server_;
        const auto self = shared_from_this();
        loop().post([alive, server, self] {
            if (alive.lock()) server->forget(self.get());
        });
    }

    SoftPlcSimulator& server_;
    std::shared_ptr<platform::TcpStream> stream_;
    platform::Timer resend_;
    Subscription tick_;
    ServerFrameReader reader_;
    std::deque<Pending> unacked_;
    int32_t number_ = 0;
    bool open_ = true;
    bool splitting_ = false;
    std::string deferred_;
};

SoftPlcSimulator::SoftPlcSimulator(Options options) : options_(options), stepTimer_(loop()) {
    stepTick_ = stepTimer_.Tick.subscribe([this] { step(); });
    if (options_.stepMs > 0) {
        stepTimer_.Interval(options_.stepMs);
        stepTimer_.Enabled(true);
    }
}

SoftPlcSimulator::~SoftPlcSimulator() {
    *alive_ = false;
    stopListening();
}

std::unique_ptr<SoftPlcSimulator> SoftPlcSimulator::OnLoopback(int32_t port, Options options) {
    std::unique_ptr<SoftPlcSimulator> sim(new SoftPlcSimulator(options));
    sim->listenOnLoopback(port);
    return sim;
}

std::unique_ptr<SoftPlcSimulator> SoftPlcSimulator::OnLoopback(int32_t port) {
    return OnLoopback(port, Options{});
}

std::unique_ptr<SoftPlcSimulator> SoftPlcSimulator::InMemory(const std::string& host, int32_t port,
                                                             Options options) {
    std::unique_ptr<SoftPlcSimulator> sim(new SoftPlcSimulator(options));
    sim->listenInMemory(host, port);
    return sim;
}

std::unique_ptr<SoftPlcSimulator> SoftPlcSimulator::InMemory(const std::string& host,
                                                             int32_t port) {
    return InMemory(host, port, Options{});
}

void SoftPlcSimulator::listenOnLoopback(int32_t port) {
    inMemory_ = false;
    listener_ = std::make_unique<platform::SocketListener>(
        loop(), host_, port, [this](std::shared_ptr<platform::TcpStream> s) { accept(s); });
    port_ = listener_->port();
    listening_ = true;
}

void SoftPlcSimulator::listenInMemory(const std::string& host, int32_t port) {
    inMemory_ = true;
    host_ = host;
    port_ = port;
    const std::weak_ptr<bool> alive = alive_;
    Runtime::current().tcp().plug(host, port,
                                  [this, alive](const std::shared_ptr<platform::MemoryTcpLink>& l) {
                                      if (alive.lock()) accept(l->serverEnd());
                                  });
    listening_ = true;
}

void SoftPlcSimulator::accept(std::shared_ptr<platform::TcpStream> stream) {
    auto session = std::make_shared<Session>(*this, std::move(stream));
    sessions_.push_back(session);
    session->start();
}

void SoftPlcSimulator::forget(Session* session) {
    sessions_.remove_if([session](const auto& s) { return s.get() == session; });
}

void SoftPlcSimulator::stopListening() {
    if (listening_) {
        if (inMemory_)
            Runtime::current().tcp().unplug(host_, port_);
        else
            listener_.reset();
    }
    listening_ = false;
    closeConnections();
}

void SoftPlcSimulator::startListening() {
    if (listening_) return;
    if (inMemory_)
        listenInMemory(host_, port_);
    else
        listenOnLoopback(port_);
}

void SoftPlcSimulator::closeConnections() {
    const auto sessions = std::move(sessions_);
    sessions_.clear();
    for (const auto& s : sessions) s->close();
}

std::string SoftPlcSimulator::endpoint() const {
    return host_ + ":" + std::to_string(port_);
}

size_t SoftPlcSimulator::clients() const {
    return static_cast<size_t>(
        std::count_if(sessions_.begin(), sessions_.end(), [](const auto& s) { return s->open(); }));
}

std::vector<int32_t> SoftPlcSimulator::subscribed() const {
    std::vector<int32_t> handles;
    for (const auto& s : sessions_)
        for (const auto& [h, name] : s->subscription) handles.push_back(h);
    return handles;
}

std::optional<SoftPlcSimulator::Tag> SoftPlcSimulator::tag(int32_t handle) const {
    const auto it = tags_.find(handle);
    if (it == tags_.end()) return std::nullopt;
    return it->second;
}

SoftPlcSimulator::Tag& SoftPlcSimulator::tagFor(int32_t handle, const std::string& name) {
    auto [it, added] = tags_.try_emplace(handle);
    if (added) {
        // A starting value of its own for each name, so tags can be told apart.
        unsigned sum = 0;
        for (const char c : name) sum += static_cast<unsigned char>(c);
        it->second.value = std::to_string(sum % 100);
    }
    if (!name.empty()) it->second.name = name;
    return it->second;
}

void SoftPlcSimulator::transmit(Session& session, std::string frame) {
    if (corruptNext_ > 0) {
        --corruptNext_;
        char& digit = frame[frame.size() - 3];  // the last CRC digit
        digit = static_cast<char>(digit == '9' ? '0' : digit + 1);
    }
    if (splitNext_ > 0) {
        --splitNext_;
        session.writeSplit(frame, options_.splitGapMs);
        return;
    }
    session.write(frame);
}

void SoftPlcSimulator::onFrame(Session& session, const std::string& type, const std::string& data) {
    received_.push_back(type + " " + data);
    if (received_.size() > kReceivedKept) received_.erase(received_.begin());
    if (type == "TSL") {
        const auto fields = fieldsOf(data);
        const auto count = fields.size() > 1 ? wholeNumber(fields[1]) : std::nullopt;
        if (!count || *count < 0 || fields.size() < 2 + 2 * static_cast<size_t>(*count)) {
            session.send("ERR", "bad subscription");
            return;
        }
        session.subscription.clear();
        for (int64_t i = 0; i < *count; ++i) {
            const auto handle = wholeNumber(fields[2 + 2 * i]);
            if (!handle) continue;
            const std::string& name = fields[3 + 2 * i];
            tagFor(static_cast<int32_t>(*handle), name);
            session.subscription.emplace_back(static_cast<int32_t>(*handle), name);
        }
        // A new subscriber gets every value at once.
        push(session, nullptr);
    } else if (type == "RSL") {
        session.subscription.clear();
    } else if (type == "NTV" || type == "ATV") {
        applyWrites(session, type, data);
    }
}

void SoftPlcSimulator::applyWrites(Session& session, const std::string& type,
                                   const std::string& data) {
    const auto fields = fieldsOf(data);
    const auto count = wholeNumber(fields[0]);
    if (!count || *count < 0) {
        session.send("ERR", "bad " + type);
        return;
    }
    std::vector<int32_t> changed;
    if (type == "NTV") {
        if (fields.size() < 1 + 2 * static_cast<size_t>(*count)) {
            session.send("ERR", "bad NTV");
            return;
        }
        for (int64_t i = 0; i < *count; ++i) {
            const auto handle = wholeNumber(fields[1 + 2 * i]);
            if (!handle) continue;
            Tag& t = tagFor(static_cast<int32_t>(*handle), {});
            t.value = fields[2 + 2 * i];
            t.moving = false;  // a written value holds until it is written again
            changed.push_back(static_cast<int32_t>(*handle));
        }
    } else {
        const auto handle = fields.size() > 1 ? wholeNumber(fields[1]) : std::nullopt;
        if (!handle || fields.size() < 2 + static_cast<size_t>(*count)) {
            session.send("ERR", "bad ATV");
            return;
        }
        std::string joined;
        for (int64_t i = 0; i < *count; ++i) joined += (i ? "," : "") + fields[2 + i];
        Tag& t = tagFor(static_cast<int32_t>(*handle), {});
        t.value = joined;
        t.moving = false;
        changed.push_back(static_cast<int32_t>(*handle));
    }
    pushToSubscribers(changed);
}

void SoftPlcSimulator::pushToSubscribers(const std::vector<int32_t>& handles) {
    if (handles.empty()) return;
    const auto sessions = sessions_;  // a send may end a session
    for (const auto& s : sessions) push(*s, &handles);
}

void SoftPlcSimulator::push(Session& session, const std::vector<int32_t>* handles) {
    std::string text;
    int32_t n = 0;
    for (const auto& [h, name] : session.subscription) {
        if (handles && std::find(handles->begin(), handles->end(), h) == handles->end()) continue;
        const std::string field = ";~" + std::to_string(h) + ";~" + tags_[h].value;
        if (options_.oneValuePerFrame) {
            session.send("NTV", "1" + field);
            continue;
        }
        text += field;
        ++n;
    }
    if (n > 0) session.send("NTV", std::to_string(n) + text);
}

void SoftPlcSimulator::setValue(int32_t handle, const std::string& value) {
    Tag& t = tagFor(handle, {});
    t.value = value;
    t.moving = decimalNumber(value).has_value();
    pushToSubscribers({handle});
}

void SoftPlcSimulator::step() {
    if (silent_) return;
    std::vector<int32_t> changed;
    for (const int32_t h : subscribed()) {
        if (std::find(changed.begin(), changed.end(), h) != changed.end()) continue;
        Tag& t = tags_[h];
        if (!t.moving) continue;
        if (const auto n = wholeNumber(t.value)) {
            t.value = std::to_string((*n + 1 + (h < 0 ? -h : h) % 7) % 1000);
        } else if (const auto d = decimalNumber(t.value)) {
            t.value = decimalText(*d + 0.5);
        } else {
            continue;
        }
        changed.push_back(h);
    }
    pushToSubscribers(changed);
}

void SoftPlcSimulator::flood(int32_t frames) {
    const auto sessions = sessions_;
    for (int32_t i = 0; i < frames; ++i)
        for (const auto& s : sessions) push(*s, nullptr);
}

std::string SoftPlcSimulator::help() const {
    return "values              list the tags with their values\n"
           "set HANDLE VALUE    set a tag and push it to its subscribers\n"
           "step                move every subscribed value one step now\n"
           "drop-acks N         take the next N frames without acknowledging them\n"
           "nak N               answer the next N frames with a NAK\n"
           "split N             send the next N frames in two writes each\n"
           "corrupt N           send the next N frames with a wrong CRC\n"
           "silent on|off       stop answering anything (and resume)\n"
           "close               close every client connection\n"
           "stop, start         stop listening (closing every connection), listen again\n"
           "restart             stop, then start\n"
           "flood N             push N frames with every subscribed value at once\n"
           "clients             how many clients are connected, and what they subscribe\n"
           "received            the last frames received\n";
}

std::string SoftPlcSimulator::command(std::string_view line) {
    std::istringstream in{std::string(line)};
    std::string word;
    in >> word;
    auto count = [&]() -> std::optional<int32_t> {
        std::string text;
        if (!(in >> text)) return std::nullopt;
        const auto n = wholeNumber(text);
        if (!n || *n < 0 || *n > 1000000) return std::nullopt;
        return static_cast<int32_t>(*n);
    };
    const std::string usage = "usage: " + word + " N (a whole number from 0)";
    if (word == "help") return help();
    if (word == "values") {
        if (tags_.empty()) return "no tags yet (a client subscribes them)";
        std::string out;
        for (const auto& [h, t] : tags_) {
            if (!out.empty()) out += "\n";
            out += std::to_string(h) + " " + t.name + " = " + t.value;
        }
        return out;
    }
    if (word == "set") {
        std::string handleText;
        in >> handleText;
        const auto handle = wholeNumber(handleText);
        std::string value;
        std::getline(in, value);
        value.erase(0, std::min(value.find_first_not_of(' '), value.size()));
        if (!handle || value.empty()) return "usage: set HANDLE VALUE";
        setValue(static_cast<int32_t>(*handle), value);
        return "set " + std::to_string(*handle) + " = " + value;
    }
    if (word == "step") {
        step();
        return "stepped";
    }
    if (word == "drop-acks" || word == "nak" || word == "split" || word == "corrupt" ||
        word == "flood") {
        const auto n = count();
        if (!n) return usage;
        if (word == "drop-acks") dropAcks(*n);
        if (word == "nak") nakNext(*n);
        if (word == "split") splitNext(*n);
        if (word == "corrupt") corruptNext(*n);
        if (word == "flood") flood(*n);
        return word + " " + std::to_string(*n);
    }
    if (word == "silent") {
        std::string on;
        in >> on;
        if (on != "on" && on != "off") return "usage: silent on|off";
        setSilent(on == "on");
        return on == "on" ? "silent: no answers, no pushes" : "answering again";
    }
    if (word == "close") {
        const size_t n = clients();
        closeConnections();
        return "closed " + std::to_string(n) + " connection(s)";
    }
    if (word == "stop") {
        stopListening();
        return "stopped listening";
    }
    if (word == "start" || word == "restart") {
        try {
            if (word == "restart") stopListening();
            startListening();
        } catch (const VbError& e) {
            return "cannot listen: " + e.description();
        }
        return "listening on " + endpoint();
    }
    if (word == "clients") {
        std::string out = std::to_string(clients()) + " client(s)";
        for (const auto& s : sessions_) {
            out += "\n  subscribed:";
            for (const auto& [h, name] : s->subscription)
                out += " " + std::to_string(h) + "=" + name;
            out += ", unacknowledged " + std::to_string(s->unackedCount());
        }
        return out;
    }
    if (word == "received") {
        std::string out;
        const size_t from = received_.size() > 10 ? received_.size() - 10 : 0;
        for (size_t i = from; i < received_.size(); ++i)
            out += (out.empty() ? "" : "\n") + received_[i];
        return out.empty() ? "nothing received yet" : out;
    }
    return "unknown command '" + word + "' (type help)";
}

}  // namespace maroset::sim
