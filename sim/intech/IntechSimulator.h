#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "lang/Subscription.h"
#include "platform/EventLoop.h"
#include "platform/Timer.h"
#include "platform/serial/PseudoTerminal.h"
#include "platform/serial/SerialDevice.h"
#include "sim/Simulator.h"
#include "sim/intech/IntechInstrument.h"

namespace maroset::sim {

// Intech instruments on one serial line, as a host sees them: one or more stations ("01",
// "02", ...) that answer the read commands and the output write of the "@" ASCII protocol.
//
// A request is "@" + address + command + BCC + carriage return; one whose BCC does not add up,
// or for an address nobody has, gets no answer (the line is shared). Answers, each ending in
// ":", two uppercase BCC digits and a carriage return:
//   EX E5 0g:   "@aaEX E5 0g v0 v1 v2 v3:" with eight hexadecimal digits per value (IEEE
//               single, most significant byte first), LAI 4g+1 .. 4g+4
//   EX DI:      "@aaEX DI oooo iiii:", the output and input words as four decimal digits
//   EX En:      "@aaEX En x0 x1 ... x15:", three hexadecimal digits per value, EAI
//               16(n-1)+1 .. 16n
//   EX DO nnnv 0000:  output nnn (001 or 002) set to v (0 off, any other integer on),
//               answered "@aaOK:"; a value that is not an integer, or another output, is
//               answered "@aaER:".
//
// Faults apply to the next replies of any station: silence, a wrong BCC, a frame cut off
// before its ":", the reply code "ER" instead of the answer, and padding that brings the BCC
// sum below 16 (the instrument still sends two digits, "0A").
class IntechSimulator final : public Simulator {
  public:
    enum class Fault { None, Silence, BadBcc, Truncate, UnknownCode, LowSum };
    // Replies a fault applies to when it has no count: every one until Fault::None.
    static constexpr int32_t Always = -1;

    // Serves the stations on `line` (the device's end of a cable, or a pseudo-terminal's
    // master side); `endpoint` is what endpoint() shows.
    IntechSimulator(platform::EventLoop& loop, std::shared_ptr<platform::SerialDevice> line,
                    std::string endpoint, const std::vector<std::string>& addresses = {"01"});
    // A simulator on a new pseudo-terminal, whose path is the endpoint.
    static std::unique_ptr<IntechSimulator> OnPseudoTerminal(
        platform::EventLoop& loop, const std::vector<std::string>& addresses = {"01"});
    ~IntechSimulator() override;
    IntechSimulator(const IntechSimulator&) = delete;
    IntechSimulator& operator=(const IntechSimulator&) = delete;

    // The station at this address, or nullptr.
    IntechInstrument* station(std::string_view address);

    // The next `replies` replies (Always: until Fault::None) get this fault.
    void setFault(Fault fault, int32_t replies = 1);
    Fault fault() const { return fault_; }
    // Values drift every `ms` milliseconds (0: they stay as set).
    void setDrift(int32_t ms);

    // Counters: request lines seen, requests answered, requests ignored (bad BCC, unknown
    // address or command).
    int64_t requests() const { return requests_; }
    int64_t replies() const { return replies_; }
    int64_t ignored() const { return ignored_; }

    std::string endpoint() const override { return endpoint_; }
    std::string help() const override;
    std::string command(std::string_view line) override;

    // Builds one reply frame as the instrument sends it: "@" + address + payload + ":" + two
    // BCC digits + carriage return.
    static std::string Frame(std::string_view address, std::string_view payload);

  private:
    void received(std::string_view bytes);
    void request(const std::string& line);
    std::string answer(IntechInstrument& station, const std::string& command);
    void reply(const std::string& address, const std::string& payload);

    platform::EventLoop& loop_;
    std::unique_ptr<platform::PseudoTerminal> pty_;
    std::shared_ptr<platform::SerialDevice> line_;
    std::string endpoint_;
    std::vector<IntechInstrument> stations_;
    std::string pending_;
    Fault fault_ = Fault::None;
    int32_t faultReplies_ = 0;
    platform::Timer drift_;
    Subscription driftTick_;
    int32_t driftStep_ = 0;
    int64_t requests_ = 0;
    int64_t replies_ = 0;
    int64_t ignored_ = 0;
};

}  // namespace maroset::sim
