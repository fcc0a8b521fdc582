#include "sim/df1/Df1Simulator.h"

#include <charconv>
#include <iterator>
#include <sstream>
#include <stdexcept>

#include "core/Crc16Arc.h"
#include "lang/Strings.h"

namespace maroset::sim {

namespace {

constexpr uint8_t kDle = 0x10, kStx = 0x02, kEtx = 0x03, kEnq = 0x05, kAck = 0x06, kNak = 0x15;
constexpr uint8_t kTypedCommand = 0x0F, kTypedRead = 0xA2, kTypedWrite = 0xAA;
constexpr uint8_t kStsIllegalCommand = 0x10, kStsExtended = 0xF0, kExtBadAddress = 0x06;
constexpr size_t kFileWords = 256;

struct TypeLetters {
    std::string_view letters;
    uint8_t code;
};
constexpr TypeLetters kTypes[] = {{"S", 0x84}, {"B", 0x85}, {"T", 0x86}, {"C", 0x87}, {"R", 0x88},
                                  {"N", 0x89}, {"F", 0x8A}, {"O", 0x8B}, {"I", 0x8C}, {"ST", 0x8D}};

// A DF1 frame around a body: data DLEs doubled, the CRC over the body and ETX.
std::string Frame(const std::string& body, bool corruptCheck) {
    std::string out{char(kDle), char(kStx)};
    for (const char c : body) {
        out += c;
        if (static_cast<uint8_t>(c) == kDle) out += c;
    }
    uint16_t crc = crc16arc::Fold(body);
    crc = crc16arc::Fold(kEtx, crc);
    if (corruptCheck) crc ^= 0x00FF;
    out += char(kDle);
    out += char(kEtx);
    out += static_cast<char>(crc & 0xFF);
    out += static_cast<char>(crc >> 8);
    return out;
}

std::vector<std::string> Words(std::string_view line) {
    std::vector<std::string> words;
    std::istringstream in{std::string(line)};
    for (std::string w; in >> w;) words.push_back(w);
    return words;
}

std::optional<int> Number(const std::string& text) {
    int value = 0;
    const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (ec != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return value;
}

}  // namespace

Df1Simulator::Df1Simulator(platform::EventLoop& loop, std::shared_ptr<platform::SerialDevice> line,
                           std::string endpoint)
    : loop_(loop), line_(std::move(line)), endpoint_(std::move(endpoint)), driftTimer_(loop) {
    for (const auto& [type, number] : std::initializer_list<FileKey>{{0x85, 3},
                                                                     {0x86, 4},
                                                                     {0x87, 5},
                                                                     {0x88, 6},
                                                                     {0x89, 7},
                                                                     {0x8A, 8},
                                                                     {0x89, 9},
                                                                     {0x89, 10}})
        files_[{type, number}].assign(kFileWords, 0);
    driftTick_ = driftTimer_.Tick.subscribe([this] { driftTick(); });
    line_->listen({[this, alive = alive_](std::string_view bytes) {
                       if (*alive) received(bytes);
                   },
                   {}});
}

std::unique_ptr<Df1Simulator> Df1Simulator::OnPseudoTerminal(platform::EventLoop& loop) {
    auto pty = std::make_unique<platform::PseudoTerminal>(loop);
    auto sim = std::make_unique<Df1Simulator>(loop, pty->deviceEnd(), pty->path());
    sim->pty_ = std::move(pty);
    return sim;
}

Df1Simulator::~Df1Simulator() {
    *alive_ = false;
    line_->stopListening();
}

// ---- Line -----------------------------------------------------------------------------------

void Df1Simulator::received(std::string_view bytes) {
    const std::shared_ptr<bool> alive = alive_;
    for (const char c : bytes) {
        onByte(static_cast<uint8_t>(c));
        if (!*alive) return;
    }
}

void Df1Simulator::onByte(uint8_t b) {
    switch (state_) {
        case Rx::Idle:
            if (b == kDle) state_ = Rx::AfterDle;
            break;
        case Rx::AfterDle:
            state_ = Rx::Idle;
            if (b == kStx) {
                body_.clear();
                state_ = Rx::Body;
            } else if (b == kAck || b == kNak || b == kEnq) {
                onLinkControl(b);
            }
            break;
        case Rx::Body:
            if (b == kDle)
                state_ = Rx::BodyDle;
            else
                body_ += static_cast<char>(b);
            break;
        case Rx::BodyDle:
            if (b == kDle) {
                body_ += static_cast<char>(kDle);
                state_ = Rx::Body;
            } else if (b == kEtx) {
                state_ = Rx::CheckLow;
            } else if (b == kStx) {
                body_.clear();  // a new frame starts over the unfinished one
                state_ = Rx::Body;
            } else {
                state_ = Rx::Idle;  // the frame is broken off
                if (b == kAck || b == kNak || b == kEnq) onLinkControl(b);
            }
            break;
        case Rx::CheckLow:
            checkLow_ = b;
            state_ = Rx::CheckHigh;
            break;
        case Rx::CheckHigh: {
            state_ = Rx::Idle;
            const uint16_t crc = crc16arc::Fold(kEtx, crc16arc::Fold(body_));
            onFrame(checkLow_ == (crc & 0xFF) && b == (crc >> 8));
            break;
        }
    }
}

void Df1Simulator::onLinkControl(uint8_t b) {
    if (silentFrames_ != 0) return;
    if (b == kEnq) {
        ++counters_.enqsReceived;
        send({char(kDle), char(lastLinkReply_)});
    } else if (b == kAck) {
        resendsLeft_ = 0;
    } else if (b == kNak && resendsLeft_ > 0) {
        --resendsLeft_;
        sendReply(lastReply_);
    }
}

void Df1Simulator::onFrame(bool goodCheck) {
    if (silentFrames_ != 0) {
        if (silentFrames_ > 0) --silentFrames_;
        return;
    }
    if (!goodCheck) {
        ++counters_.badChecks;
        ++counters_.naksSent;
        lastLinkReply_ = kNak;
        send({char(kDle), char(kNak)});
        return;
    }
    ++counters_.framesReceived;
    if (nakFrames_ > 0) {
        --nakFrames_;
        ++counters_.naksSent;
        lastLinkReply_ = kNak;
        send({char(kDle), char(kNak)});
        return;
    }
    lastLinkReply_ = kAck;
    send({char(kDle), char(kAck)});
    lastRequest_ = body_;
    const std::string reply = execute(body_);
    if (reply.empty()) return;
    const bool corrupt = corruptReplies_ > 0;
    if (corrupt) --corruptReplies_;
    lastReply_ = Frame(reply, corrupt);
    resendsLeft_ = 3;
    sendReply(lastReply_);
    if (corrupt) lastReply_ = Frame(reply, false);  // a resend after NAK goes out right
}

void Df1Simulator::sendReply(const std::string& frame) {
    ++counters_.repliesSent;
    if (pauseMs_ <= 0) {
        send(frame);
        return;
    }
    // The first half now, the rest after the pause: the host sees a gap inside the frame.
    const size_t half = frame.size() / 2;
    send(frame.substr(0, half));
    loop_.schedule(platform::EventLoop::Duration(pauseMs_),
                   [this, alive = std::weak_ptr<bool>(alive_), rest = frame.substr(half)] {
                       if (const auto a = alive.lock(); a && *a) send(rest);
                   });
    pauseMs_ = 0;
}

void Df1Simulator::send(std::string bytes) {
    try {
        line_->write(bytes);
    } catch (const std::exception&) {
        // Nobody on the line: a PLC's bytes are lost the same way.
    }
}

// ---- Commands -------------------------------------------------------------------------------

std::vector<int16_t>* Df1Simulator::file(uint8_t type, uint16_t number) {
    const auto it = files_.find({type, number});
    return it == files_.end() ? nullptr : &it->second;
}

std::string Df1Simulator::execute(const std::string& request) {
    if (request.size() < 6) return {};  // not even a header: nothing to answer
    auto at = [&](size_t i) { return static_cast<uint8_t>(request[i]); };
    std::string reply{request[1], request[0], static_cast<char>(at(2) | 0x40),
                      0,          request[4], request[5]};
    auto fail = [&](uint8_t sts, bool extended) {
        reply[3] = static_cast<char>(sts);
        if (extended) reply += static_cast<char>(kExtBadAddress);
        return reply;
    };
    if (at(2) != kTypedCommand || request.size() < 8) return fail(kStsIllegalCommand, false);
    const uint8_t fnc = at(6);
    if (fnc != kTypedRead && fnc != kTypedWrite) return fail(kStsIllegalCommand, false);

    // Byte size, then file number, file type, element, sub-element: each number one byte,
    // or 0xFF followed by two bytes, low first.
    size_t pos = 7;
    bool shortRequest = false;
    auto next = [&]() -> uint16_t {
        if (pos >= request.size()) {
            shortRequest = true;
            return 0;
        }
        return at(pos++);
    };
    auto number = [&]() -> uint16_t {
        const uint16_t first = next();
        if (first != 0xFF) return first;
        const uint16_t low = next();
        return static_cast<uint16_t>(low | (next() << 8));
    };
    const uint16_t size = next();
    const uint16_t fileNumber = number();
    const uint16_t fileType = next();
    const uint16_t element = number();
    number();  // sub-element: every file here is plain words
    if (shortRequest) return fail(kStsIllegalCommand, false);

    std::vector<int16_t>* words = file(static_cast<uint8_t>(fileType), fileNumber);
    if (!words || size_t(element) * 2 + size > words->size() * 2) return fail(kStsExtended, true);
    auto byteAt = [&](size_t i) -> uint8_t {
        const auto w = static_cast<uint16_t>((*words)[element + i / 2]);
        return static_cast<uint8_t>(i % 2 ? w >> 8 : w & 0xFF);
    };
    if (fnc == kTypedRead) {
        for (size_t i = 0; i < size; ++i) reply += static_cast<char>(byteAt(i));
        return reply;
    }
    if (request.size() < pos + size) return fail(kStsIllegalCommand, false);
    for (size_t i = 0; i < size; ++i) {
        auto& w = (*words)[element + i / 2];
        const auto b = static_cast<uint16_t>(at(pos + i));
        const auto u = static_cast<uint16_t>(w);
        w = static_cast<int16_t>(i % 2 ? (u & 0x00FF) | (b << 8) : (u & 0xFF00) | b);
    }
    ++counters_.writes;
    return reply;
}

// ---- Data and faults ------------------------------------------------------------------------

std::optional<std::pair<Df1Simulator::FileKey, uint16_t>> Df1Simulator::parseAddress(
    std::string_view address) const {
    const size_t colon = address.find(':');
    if (colon == std::string_view::npos) return std::nullopt;
    size_t digits = 0;
    while (digits < colon && !(address[digits] >= '0' && address[digits] <= '9')) ++digits;
    const std::string letters = UCase(address.substr(0, digits));
    const auto fileNumber = Number(std::string(address.substr(digits, colon - digits)));
    const auto element = Number(std::string(address.substr(colon + 1)));
    if (!fileNumber || !element || *element < 0 || *element >= int(kFileWords)) return std::nullopt;
    for (const auto& t : kTypes) {
        if (t.letters == letters) return std::make_pair(FileKey{t.code, *fileNumber}, *element);
    }
    return std::nullopt;
}

std::optional<int16_t> Df1Simulator::word(std::string_view address) const {
    const auto a = parseAddress(address);
    if (!a) return std::nullopt;
    const auto it = files_.find(a->first);
    if (it == files_.end()) return std::nullopt;
    return it->second[a->second];
}

void Df1Simulator::setWord(std::string_view address, int16_t value) {
    const auto a = parseAddress(address);
    std::vector<int16_t>* words = a ? file(a->first.first, a->first.second) : nullptr;
    if (!words) throw std::invalid_argument("no such word: " + std::string(address));
    (*words)[a->second] = value;
}

void Df1Simulator::nakNext(int frames) {
    nakFrames_ = frames;
}

void Df1Simulator::silence(int frames) {
    silentFrames_ = frames;
}

void Df1Simulator::corruptNextReplies(int replies) {
    corruptReplies_ = replies;
}

void Df1Simulator::pauseNextReply(int ms) {
    pauseMs_ = ms;
}

void Df1Simulator::sendEnq() {
    send({char(kDle), char(kEnq)});
}

void Df1Simulator::drift(int ms) {
    driftMs_ = ms;
    driftTimer_.Enabled(false);
    if (ms <= 0) return;
    driftTimer_.Interval(ms);
    driftTimer_.Enabled(true);
}

void Df1Simulator::driftTick() {
    // Values with the byte 0x10 in them go out as doubled DLEs.
    static constexpr int16_t kPattern[] = {0x1010, 16, 0x0110, 0x1000, -16, 4660, 0x10FF, 0};
    ++driftStep_;
    std::vector<int16_t>& n7 = files_[{0x89, 7}];
    n7[0] = static_cast<int16_t>(n7[0] + 1);
    const int ramp = (driftStep_ * 5) % 200;
    n7[1] = static_cast<int16_t>(ramp <= 100 ? ramp : 200 - ramp);
    n7[2] = kPattern[driftStep_ % std::size(kPattern)];
}

std::string Df1Simulator::help() const {
    return "set ADDR VALUE     set a word (set N7:5 -120); files B3 T4 C5 R6 N7 F8 N9 N10\n"
           "get ADDR           show a word\n"
           "nak [K]            answer the next K frames (1) with DLE NAK\n"
           "silent [K|on|off]  ignore the next K frames (1), or everything until 'silent off'\n"
           "badcrc [K]         corrupt the check bytes of the next K replies (1)\n"
           "pause [MS]         stop MS ms (50) in the middle of the next reply\n"
           "enq                send DLE ENQ now\n"
           "drift [MS|off]     change N7:0-2 every MS ms (1000), or stop\n"
           "status             counters and pending faults\n"
           "help               this list";
}

std::string Df1Simulator::status() const {
    std::ostringstream out;
    out << "frames " << counters_.framesReceived << ", bad checks " << counters_.badChecks
        << ", NAKs sent " << counters_.naksSent << ", replies " << counters_.repliesSent
        << ", ENQs " << counters_.enqsReceived << ", writes " << counters_.writes
        << "; pending: nak " << nakFrames_ << ", silent "
        << (silentFrames_ < 0 ? std::string("on") : std::to_string(silentFrames_)) << ", badcrc "
        << corruptReplies_ << ", pause " << pauseMs_ << " ms, drift "
        << (driftMs_ > 0 ? std::to_string(driftMs_) + " ms" : std::string("off"));
    return out.str();
}

std::string Df1Simulator::command(std::string_view line) {
    const std::vector<std::string> w = Words(line);
    if (w.empty()) return "empty command (try help)";
    const std::string& verb = w[0];
    auto count = [&](int fallback) -> std::optional<int> {
        if (w.size() < 2) return fallback;
        const auto n = Number(w[1]);
        if (!n || *n < 0) return std::nullopt;
        return n;
    };
    if (verb == "help") return help();
    if (verb == "status") return status();
    if (verb == "enq") {
        sendEnq();
        return "sent DLE ENQ";
    }
    if (verb == "get" && w.size() == 2) {
        const auto v = word(w[1]);
        return v ? w[1] + " = " + std::to_string(*v) : "no such word: " + w[1];
    }
    if (verb == "set" && w.size() == 3) {
        const auto v = Number(w[2]);
        if (!v || *v < -32768 || *v > 65535) return "value must be a whole number -32768..65535";
        if (!word(w[1])) return "no such word: " + w[1];
        setWord(w[1], static_cast<int16_t>(*v));
        return w[1] + " = " + std::to_string(*word(w[1]));
    }
    if (verb == "silent" && w.size() <= 2) {
        if (w.size() == 2 && (w[1] == "on" || w[1] == "off")) {
            silence(w[1] == "on" ? -1 : 0);
            return w[1] == "on" ? "silent until 'silent off'" : "answering again";
        }
        if (const auto k = count(1)) {
            silence(*k);
            return "ignoring the next " + std::to_string(*k) + " frame(s)";
        }
    }
    if (verb == "nak" && w.size() <= 2) {
        if (const auto k = count(1)) {
            nakNext(*k);
            return "NAK for the next " + std::to_string(*k) + " frame(s)";
        }
    }
    if (verb == "badcrc" && w.size() <= 2) {
        if (const auto k = count(1)) {
            corruptNextReplies(*k);
            return "bad check on the next " + std::to_string(*k) + " reply(ies)";
        }
    }
    if (verb == "pause" && w.size() <= 2) {
        if (const auto ms = count(50)) {
            pauseNextReply(*ms);
            return "the next reply pauses " + std::to_string(*ms) + " ms in the middle";
        }
    }
    if (verb == "drift" && w.size() <= 2) {
        if (w.size() == 2 && w[1] == "off") {
            drift(0);
            return "drift off";
        }
        if (const auto ms = count(1000); ms && *ms > 0) {
            drift(*ms);
            return "N7:0-2 change every " + std::to_string(*ms) + " ms";
        }
    }
    return "cannot do '" + std::string(line) + "' (try help)";
}

}  // namespace maroset::sim
