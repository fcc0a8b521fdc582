#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "lang/Subscription.h"
#include "platform/EventLoop.h"
#include "platform/Timer.h"
#include "platform/serial/PseudoTerminal.h"
#include "platform/serial/SerialDevice.h"
#include "sim/Simulator.h"

namespace maroset::sim {

// An Allen-Bradley PLC on a DF1 full-duplex line, as a host sees it: it answers DLE ACK to a
// good frame and DLE NAK to a bad check, executes protected typed logical reads (CMD 0x0F,
// FNC 0xA2) and writes (FNC 0xAA) on its data files, and sends the reply (CMD 0x4F, STS 0, TNS
// echoed, data DLEs doubled, CRC-16) right after the ACK. DLE ENQ is answered with its last
// link reply; a DLE NAK to a reply makes it send the reply again (three times at most).
//
// Data files, 256 words each: B3, T4, C5, R6, N7, F8 (all plain 16-bit words here) and N9,
// N10. A request for any other file, or beyond a file's end, is answered with STS 0xF0 and
// EXT STS 0x06; an unknown command or function with STS 0x10.
//
// Faults on demand (typed methods for tests, command() lines for an operator): NAK the next
// k frames, stay silent for k frames or until told, corrupt the check of the next k replies,
// pause in the middle of the next reply, send DLE ENQ. With drift on, N7:0 counts up, N7:1
// ramps and N7:2 runs through values holding the byte 0x10, so doubled DLEs go over the line.
//
// It runs on the loop it is given and speaks through one end of a line (a memory cable's
// device end, or a pseudo-terminal's). Its framing is its own, written apart from the
// driver's; only the CRC is shared.
class Df1Simulator final : public Simulator {
  public:
    Df1Simulator(platform::EventLoop& loop, std::shared_ptr<platform::SerialDevice> line,
                 std::string endpoint = "memory line");
    // A simulator serving a new pseudo-terminal; endpoint() is the terminal's path.
    static std::unique_ptr<Df1Simulator> OnPseudoTerminal(platform::EventLoop& loop);
    ~Df1Simulator() override;
    Df1Simulator(const Df1Simulator&) = delete;
    Df1Simulator& operator=(const Df1Simulator&) = delete;

    std::string endpoint() const override { return endpoint_; }
    std::string help() const override;
    std::string command(std::string_view line) override;

    // Data. Addresses as "N7:5" (file type letters, file number, element); a file the PLC does
    // not have gives nothing / fails with std::invalid_argument.
    std::optional<int16_t> word(std::string_view address) const;
    void setWord(std::string_view address, int16_t value);

    // Faults.
    void nakNext(int frames);
    // Ignores the next `frames` frames and everything else meanwhile; -1: until silence(0).
    void silence(int frames);
    void corruptNextReplies(int replies);
    // The next reply stops after its first half for `ms` milliseconds.
    void pauseNextReply(int ms);
    void sendEnq();
    // N7:0..2 change every `ms` milliseconds (0 stops the drift).
    void drift(int ms);

    struct Counters {
        int framesReceived = 0;  // whole frames with a good check
        int badChecks = 0;       // frames with a bad check (answered NAK)
        int naksSent = 0;
        int repliesSent = 0;  // reply frames, resends included
        int enqsReceived = 0;
        int writes = 0;  // write requests executed
    };
    const Counters& counters() const { return counters_; }
    // The unstuffed body (DST onward) of the last frame executed.
    const std::string& lastRequest() const { return lastRequest_; }

  private:
    enum class Rx { Idle, AfterDle, Body, BodyDle, CheckLow, CheckHigh };
    using FileKey = std::pair<uint8_t, uint16_t>;  // file-type byte, file number

    void received(std::string_view bytes);
    void onByte(uint8_t b);
    void onLinkControl(uint8_t b);
    void onFrame(bool goodCheck);
    std::string execute(const std::string& request);
    void sendReply(const std::string& frame);
    void send(std::string bytes);
    void driftTick();
    std::vector<int16_t>* file(uint8_t type, uint16_t number);
    std::optional<std::pair<FileKey, uint16_t>> parseAddress(std::string_view address) const;
    std::string status() const;

    platform::EventLoop& loop_;
    std::unique_ptr<platform::PseudoTerminal> pty_;  // when it owns its line
    std::shared_ptr<platform::SerialDevice> line_;
    std::string endpoint_;
    std::map<FileKey, std::vector<int16_t>> files_;

    Rx state_ = Rx::Idle;
    std::string body_;
    uint8_t checkLow_ = 0;
    uint8_t lastLinkReply_ = 21;
    std::string lastReply_;  // the last reply frame, for a resend after NAK
    int resendsLeft_ = 0;

    int nakFrames_ = 0;
    int silentFrames_ = 0;  // -1: until told
    int corruptReplies_ = 0;
    int pauseMs_ = 0;
    int driftMs_ = 0;
    int driftStep_ = 0;

    Counters counters_;
    std::string lastRequest_;
    platform::Timer driftTimer_;
    Subscription driftTick_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::sim
