#include "sim/intech/IntechSimulator.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <optional>
#include <sstream>
#include <stdexcept>
#include "lang/Strings.h"

namespace maroset::sim {

namespace {

// A request line longer than this without a carriage return is noise.
constexpr size_t kLongestRequest = 256;

unsigned bccSum(std::string_view framed) {
    unsigned sum = 0;
    for (size_t i = 1; i < framed.size(); ++i) sum += static_cast<unsigned char>(framed[i]);
    return sum & 255;
}

std::string hex(uint32_t value, int digits) {
    char buf[16];
    std::snprintf(buf, sizeof buf, "%0*X", digits, value);
    return buf;
}

std::string decimal4(int value) {
    char buf[16];
    std::snprintf(buf, sizeof buf, "%04d", value);
    return buf;
}

// An IEEE single as the instrument sends it: most significant byte first.
std::string singleHex(float value) {
    uint32_t bits;
    std::memcpy(&bits, &value, sizeof bits);
    return hex(bits, 8);
}

std::optional<int64_t> integer(std::string_view text) {
    int64_t v = 0;
    const auto res = std::from_chars(text.data(), text.data() + text.size(), v);
    if (text.empty() || res.ec != std::errc() || res.ptr != text.data() + text.size())
        return std::nullopt;
    return v;
}

std::optional<unsigned> hexNumber(std::string_view text) {
    unsigned v = 0;
    const auto res = std::from_chars(text.data(), text.data() + text.size(), v, 16);
    if (text.empty() || res.ec != std::errc() || res.ptr != text.data() + text.size())
        return std::nullopt;
    return v;
}

std::vector<std::string> words(std::string_view line) {
    std::istringstream in{std::string(line)};
    std::vector<std::string> out;
    for (std::string w; in >> w;) out.push_back(w);
    return out;
}

struct FaultName {
    const char* name;
    IntechSimulator::Fault fault;
};
constexpr FaultName kFaults[] = {
    {"none", IntechSimulator::Fault::None},        {"silence", IntechSimulator::Fault::Silence},
    {"badbcc", IntechSimulator::Fault::BadBcc},    {"truncate", IntechSimulator::Fault::Truncate},
    {"code", IntechSimulator::Fault::UnknownCode}, {"lowsum", IntechSimulator::Fault::LowSum},
};

const char* faultName(IntechSimulator::Fault f) {
    for (const auto& n : kFaults)
        if (n.fault == f) return n.name;
    return "?";
}

// Letters that bring the BCC sum of `framed` (which ends before its ":") to `target` once the
// ":" is added: never ":" or "@", which would end or restart the frame at the host.
std::string padTo(const std::string& framed, unsigned target) {
    const unsigned sum = (bccSum(framed) + ':') & 255;
    const unsigned r = (target + 256 - sum) & 255;
    if (r == 0) return {};
    unsigned total = r + 256;  // 256 or more, so that letters A-Z can always make it up
    const unsigned count = (total + 89) / 90;
    std::string pad(count, 'A');
    total -= 65 * count;
    for (char& c : pad) {
        const unsigned add = std::min(total, 25u);
        c = static_cast<char>('A' + add);
        total -= add;
    }
    return pad;
}

}  // namespace

IntechSimulator::IntechSimulator(platform::EventLoop& loop,
                                 std::shared_ptr<platform::SerialDevice> line, std::string endpoint,
                                 const std::vector<std::string>& addresses)
    : loop_(loop), line_(std::move(line)), endpoint_(std::move(endpoint)), drift_(loop) {
    for (const auto& a : addresses) {
        if (a.size() != 2)
            throw std::invalid_argument("station address '" + a + "' is not two characters");
        if (station(a)) throw std::invalid_argument("station address " + a + " given twice");
        stations_.emplace_back(a);
    }
    if (stations_.empty()) throw std::invalid_argument("no station on the line");
    line_->listen({[this](std::string_view bytes) { received(bytes); }, {}});
    driftTick_ = drift_.Tick.subscribe([this] {
        ++driftStep_;
        for (auto& s : stations_) s.drift(driftStep_);
    });
}

std::unique_ptr<IntechSimulator> IntechSimulator::OnPseudoTerminal(
    platform::EventLoop& loop, const std::vector<std::string>& addresses) {
    auto pty = std::make_unique<platform::PseudoTerminal>(loop);
    auto sim = std::make_unique<IntechSimulator>(loop, pty->deviceEnd(), pty->path(), addresses);
    sim->pty_ = std::move(pty);
    return sim;
}

IntechSimulator::~IntechSimulator() {
    line_->stopListening();
}

IntechInstrument* IntechSimulator::station(std::string_view address) {
    for (auto& s : stations_)
        if (s.address() == address) return &s;
    return nullptr;
}

void IntechSimulator::setFault(Fault fault, int32_t replies) {
    fault_ = fault;
    faultReplies_ = fault == Fault::None ? 0 : replies;
    if (faultReplies_ == 0) fault_ = Fault::None;
}

void IntechSimulator::setDrift(int32_t ms) {
    drift_.Interval(ms);
    drift_.Enabled(ms > 0);
}

std::string IntechSimulator::Frame(std::string_view address, std::string_view payload) {
    std::string framed = "@" + std::string(address) + std::string(payload) + ":";
    return framed + hex(bccSum(framed), 2) + "\r";
}

void IntechSimulator::received(std::string_view bytes) {
    for (const char c : bytes) {
        if (c == '\r') {
            std::string line;
            line.swap(pending_);
            request(line);
            continue;
        }
        if (pending_.size() >= kLongestRequest) pending_.clear();
        pending_ += c;
    }
}

void IntechSimulator::request(const std::string& line) {
    ++requests_;
    // "@", two address characters, the command up to its ":", and one or two BCC digits.
    const size_t colon = line.rfind(':');
    if (line.size() < 5 || line[0] != '@' || colon == std::string::npos || colon < 3) {
        ++ignored_;
        return;
    }
    const std::string framed = line.substr(0, colon + 1);
    const auto bcc = hexNumber(std::string_view(line).substr(colon + 1));
    IntechInstrument* target = station(std::string_view(line).substr(1, 2));
    if (!bcc || *bcc != bccSum(framed) || line.size() - colon - 1 > 2 || !target) {
        ++ignored_;
        return;
    }
    const std::string payload = answer(*target, framed.substr(3));
    if (payload.empty()) {
        ++ignored_;
        return;
    }
    reply(target->address(), payload);
}

std::string IntechSimulator::answer(IntechInstrument& station, const std::string& command) {
    if (command.size() == 9 && command.compare(0, 7, "EX E5 0") == 0 && command[8] == ':' &&
        command[7] >= '0' && command[7] <= '3') {
        const int group = command[7] - '0';
        std::string payload = "EX E5 0" + std::to_string(group);
        for (int k = 1; k <= 4; ++k) payload += " " + singleHex(station.analog(4 * group + k));
        return payload;
    }
    if (command == "EX DI:")
        return "EX DI " + decimal4(station.outputsWord()) + " " + decimal4(station.inputsWord());
    if (command.size() == 6 && command.compare(0, 4, "EX E") == 0 && command[5] == ':' &&
        command[4] >= '1' && command[4] <= '4') {
        const int block = command[4] - '0';
        std::string payload = "EX E" + std::to_string(block);
        for (int k = 1; k <= 16; ++k)
            payload += " " + hex(station.extended(16 * (block - 1) + k), 3);
        return payload;
    }
    // "EX DO nnn" + value + " 0000:"
    const std::string head = "EX DO ", tail = " 0000:";
    if (command.size() > head.size() + 3 + tail.size() &&
        command.compare(0, head.size(), head) == 0 &&
        command.compare(command.size() - tail.size(), tail.size(), tail) == 0) {
        const auto output = integer(std::string_view(command).substr(head.size(), 3));
        const auto value = integer(std::string_view(command).substr(
            head.size() + 3, command.size() - head.size() - 3 - tail.size()));
        if (!output || !value || *output < 1 || *output > IntechInstrument::OutputPoints)
            return "ER";
        station.setOutput(static_cast<int>(*output), *value != 0);
        return "OK";
    }
    return {};
}

void IntechSimulator::reply(const std::string& address, const std::string& payload) {
    Fault fault = Fault::None;
    if (fault_ != Fault::None) {
        fault = fault_;
        if (faultReplies_ > 0 && --faultReplies_ == 0) fault_ = Fault::None;
    }
    std::string frame;
    switch (fault) {
        case Fault::None:
            frame = Frame(address, payload);
            break;
        case Fault::Silence:
            return;
        case Fault::BadBcc: {
            frame = Frame(address, payload);
            const unsigned wrong = (*hexNumber(frame.substr(frame.size() - 3, 2)) + 1) & 255;
            frame.replace(frame.size() - 3, 2, hex(wrong, 2));
            break;
        }
        case Fault::Truncate: {
            const std::string whole = Frame(address, payload);
            frame = whole.substr(0, std::max<size_t>(4, whole.find(':') / 2)) + "\r";
            break;
        }
        case Fault::UnknownCode:
            frame = Frame(address, "ER");
            break;
        case Fault::LowSum: {
            const std::string framed = "@" + address + payload;
            frame = Frame(address, payload + padTo(framed, 0x0A));
            break;
        }
    }
    try {
        line_->write(frame);
        ++replies_;
    } catch (const std::exception&) {
        // The line is gone (cable cut): an instrument just talks into the void.
    }
}

std::string IntechSimulator::help() const {
    return "set TAG VALUE      set a station's value: 01LAI3 12.5, 01EAI17 1023, 01LDI2 1, "
           "01LDO1 0\n"
           "get TAG            show a value\n"
           "fault KIND [N]     the next N replies (default 1; 'always' until 'fault none'):\n"
           "                   silence, badbcc, truncate, code (reply code ER), lowsum (BCC sum\n"
           "                   below 16)\n"
           "fault none         replies are good again\n"
           "drift on|off|MS    values drift every second, not at all, or every MS ms\n"
           "status             stations, counters and the fault in force\n"
           "help               this list";
}

std::string IntechSimulator::command(std::string_view line) {
    const auto w = words(line);
    if (w.empty()) return "empty command; type help";
    const std::string verb = w[0];
    try {
        if (verb == "help") return help();
        if (verb == "status") {
            std::string s = "stations";
            for (const auto& st : stations_) s += " " + st.address();
            s += "; " + std::to_string(requests_) + " requests, " + std::to_string(replies_) +
                 " replies, " + std::to_string(ignored_) + " ignored; fault " + faultName(fault_);
            if (fault_ != Fault::None)
                s += faultReplies_ < 0 ? " (always)"
                                       : " (" + std::to_string(faultReplies_) + " more)";
            s +=
                "; drift " + (drift_.Enabled() ? std::to_string(drift_.Interval()) + " ms" : "off");
            return s;
        }
        if (verb == "drift" && w.size() == 2) {
            if (w[1] == "on")
                setDrift(1000);
            else if (w[1] == "off")
                setDrift(0);
            else if (const auto ms = integer(w[1]); ms && *ms > 0 && *ms <= 3600000)
                setDrift(static_cast<int32_t>(*ms));
            else
                return "drift takes on, off or a number of milliseconds";
            return drift_.Enabled() ? "drift every " + std::to_string(drift_.Interval()) + " ms"
                                    : "drift off";
        }
        if (verb == "fault" && (w.size() == 2 || w.size() == 3)) {
            const FaultName* f = nullptr;
            for (const auto& n : kFaults)
                if (w[1] == n.name) f = &n;
            if (!f) return "unknown fault '" + w[1] + "'; type help";
            int32_t count = 1;
            if (w.size() == 3) {
                const auto n = integer(w[2]);
                if (w[2] == "always")
                    count = Always;
                else if (n && *n > 0 && *n <= 1000000)
                    count = static_cast<int32_t>(*n);
                else
                    return "fault count must be a positive number or 'always'";
            }
            setFault(f->fault, count);
            if (f->fault == Fault::None) return "fault none";
            return std::string("fault ") + f->name +
                   (count == Always ? " on every reply"
                    : count == 1    ? " on the next reply"
                                    : " on the next " + std::to_string(count) + " replies");
        }
        if ((verb == "set" && w.size() == 3) || (verb == "get" && w.size() == 2)) {
            const std::string& tag = w[1];
            IntechInstrument* st = tag.size() > 5 ? station(tag.substr(0, 2)) : nullptr;
            if (!st) return "no station for tag '" + tag + "'";
            const std::string kind = UCase(tag.substr(2, 3));
            const auto point = integer(tag.substr(5));
            if (!point) return "tag '" + tag + "' has no point number";
            const int p = static_cast<int>(std::clamp<int64_t>(*point, -1, 1000));
            if (verb == "get") {
                if (kind == "LAI") return tag + " = " + std::to_string(st->analog(p));
                if (kind == "EAI") return tag + " = " + std::to_string(st->extended(p));
                if (kind == "LDI") return tag + " = " + std::to_string(st->input(p));
                if (kind == "LDO") return tag + " = " + std::to_string(st->output(p));
                return "unknown kind '" + kind + "' (LAI, EAI, LDI, LDO)";
            }
            const std::string& text = w[2];
            if (kind == "LAI") {
                float v = 0;
                const auto res = std::from_chars(text.data(), text.data() + text.size(), v);
                if (res.ec != std::errc() || res.ptr != text.data() + text.size() ||
                    !std::isfinite(v))
                    return "LAI values are numbers";
                st->setAnalog(p, v);
            } else {
                const auto v = integer(text);
                if (!v || *v < 0) return kind + " values are whole numbers from 0";
                if (kind == "EAI") {
                    if (*v > 4095) return "EAI values are 0 to 4095";
                    st->setExtended(p, static_cast<uint32_t>(*v));
                } else if (kind == "LDI") {
                    st->setInput(p, *v != 0);
                } else if (kind == "LDO") {
                    st->setOutput(p, *v != 0);
                } else {
                    return "unknown kind '" + kind + "' (LAI, EAI, LDI, LDO)";
                }
            }
            return "ok";
        }
    } catch (const std::out_of_range& e) {
        return e.what();
    }
    return "unknown command '" + std::string(line) + "'; type help";
}

}  // namespace maroset::sim
