#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "drivers/intech/IntechCollector.h"
#include "lang/Event.h"
#include "lang/Subscription.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"
#include "platform/LinkIncident.h"
#include "platform/Timer.h"
#include "platform/serial/SerialPort.h"

namespace maroset {

class Procedure;

// The hidden owner of an Intech instrument line: one serial port, the poll list and its
// timer, and the receive side that collects, checks and decodes replies.
//
// Requests are "@" + address + command + BCC + carriage return. The BCC is the sum of every
// character after the "@", AND 255, in uppercase hexadecimal without a leading zero. Replies
// are "@", address, reply code ("EX" data, "OK" acknowledgement), data, ":" and two BCC
// characters; a good data reply raises ReadComplete with the tag names and values it holds.
//
// Polling is a chain: each TmrScanRate tick sends the next command of the poll list, and each
// good reply sends the one after it, until the list wraps; the next cycle waits for the tick.
// There are no time-outs and no retries: a lost or rejected reply ends the chain, and the next
// tick goes on with the command after the last one sent.
//
// The port (port 1, "9600,n,8,1" from the driver) opens on the first send and stays open
// until Unload() or destruction. Errors follow the error trap with module name FrmNUVIntech;
// one that leaves a tick or a receive event is shown on the link trace and dropped.
//
// Handlers of ReadComplete may release this object (a host drops the node in its ValueChange
// handler); the owner then sends nothing more. Create it with std::make_shared so that an
// event in progress keeps it alive until it returns.
class FrmNUVIntech : public std::enable_shared_from_this<FrmNUVIntech> {
  public:
    FrmNUVIntech();
    ~FrmNUVIntech();
    FrmNUVIntech(const FrmNUVIntech&) = delete;
    FrmNUVIntech& operator=(const FrmNUVIntech&) = delete;

    static constexpr const char* Caption = "INTECH Driver";

    // The node this line belongs to: it picks the node's own port mapping and names the
    // trace lines.
    const std::string& NodeName() const { return NodeName_; }
    void NodeName(std::string name) { NodeName_ = std::move(name); }

    int16_t CommPort() const { return MSComm1.CommPort(); }
    void CommPort(int16_t port);
    std::string CommSettings() const { return MSComm1.Settings(); }
    void CommSettings(const std::string& settings);
    int32_t CommTimeOut() const { return TmrCommsTimeOut.Interval(); }
    void CommTimeOut(int32_t ms);
    // Stored only: the check is always the BCC.
    const std::string& ErrorCheckMode() const { return ErrorCheckMode_; }
    void ErrorCheckMode(std::string mode) { ErrorCheckMode_ = std::move(mode); }
    uint8_t PCNode() const { return PCNode_; }
    void PCNode(uint8_t node) { PCNode_ = node; }
    uint8_t PLCNode() const { return PLCNode_; }
    void PLCNode(uint8_t node) { PLCNode_ = node; }
    // Reads 0 whatever was set.
    uint8_t PLCWordCount() const { return 0; }
    void PLCWordCount(uint8_t) {}
    const Variant& PLCAddress() const { return PLCAddress_; }
    void PLCAddress(const Variant& v) { PLCAddress_ = v; }
    const Variant& PLCFunction() const { return PLCFunction_; }
    void PLCFunction(const Variant& v) { PLCFunction_ = v; }
    // Always 0; setting it fails at run time with 382.
    int16_t Busy() const { return 0; }
    void Busy(int16_t value);
    // Stored only (indices 0 to 255).
    int16_t DataInt(int32_t index) const { return DataInt_(index); }
    void DataInt(int32_t index, int16_t value) { DataInt_(index) = value; }

    // The poll list, from index 0. Reading or writing past its end first enlarges it to that
    // index (new entries are empty texts).
    std::string PollCommand(int32_t index);
    void PollCommand(int32_t index, const std::string& command);
    // Upper bound of the poll list (-1 before anything was registered).
    int32_t PollCommandUBound() const { return PollCommand_.UBound(); }
    // The index of the next command to send.
    int32_t PollIndex() const { return PollIndex_; }

    // Frames one command (cmd + BCC + carriage return) and writes it now, opening the port if
    // it is closed. Fails with the port's error when the device cannot be opened or written.
    void SendCommand(const std::string& cmd);
    // Sends the next poll command, unless the list has wrapped.
    void SendNextCommand();
    // Checks and decodes one collected frame: ReadComplete for a data reply, the next poll
    // command for a data reply or "OK". A frame that fails a check is dropped silently (it
    // is shown on the link trace). A frame whose BCC sum is below 16 never matches, since the
    // check has one character then: intended.
    void RXData(const std::string& frame);

    // The BCC of s: characters 2 to the end summed AND 255, uppercase hexadecimal, no
    // leading zero ("0" for empty text).
    static std::string CalcBCC(std::string_view s);
    // Eight hexadecimal digits, most significant byte first, as an IEEE single; any other
    // length gives 0.
    static float HexToSingle(std::string_view s);
    // The bytes of x lowest first, two digits each: the reverse of what HexToSingle reads.
    // Nothing calls it; the pair is kept asymmetric on purpose.
    static std::string SingleToHex(float x);

    // Closes the port and stops the timers; a reply being handled sends nothing more.
    void Unload();

    // Tells an incident of this line, about `tag` when there is one.
    void incident(platform::IncidentKind kind, std::string_view tag,
                  const platform::LinkIncident::TextSource& text) const;

    // Decoded values of one reply: tag names and values, zero-based, of equal length.
    Event<VbArray<Variant>&, VbArray<Variant>&> ReadComplete;
    // Declared for the owner's handler; never raised.
    Event<const std::string&> Complete;

    // Only TmrScanRate acts; the others are kept with their intervals and never tick into
    // anything.
    platform::Timer TmrScanRate;
    platform::Timer TmrCommsTimeOut;
    platform::Timer TmrEndOfMessage;
    platform::Timer TmrWatchDog;
    platform::SerialPort MSComm1;

    // The receive state (RxBuffer, Receiving, ColonSeen, TrailCount).
    const IntechCollector& Collector() const { return collector_; }

  private:
    void TmrScanRate_Timer();
    void MSComm1_OnComm();
    void onTick();
    void onComm();
    // Steps of a poll: the command at PollIndex, the index moved on, the command sent.
    void pollStep(Procedure& proc);
    void openPort();
    bool acceptFrame(const std::string& frame) const;
    bool decode(const std::string& block, const std::string& body, const std::string& address,
                VbArray<Variant>& names, VbArray<Variant>& values) const;
    // The node's name, or the caption before it has one.
    std::string_view traceSource() const;
    void incident(platform::IncidentKind kind,
                  const platform::LinkIncident::TextSource& text) const {
        incident(kind, {}, text);
    }
    void traceDropped();

    std::string NodeName_;
    std::string ErrorCheckMode_;
    uint8_t PCNode_ = 0;
    uint8_t PLCNode_ = 0;
    Variant PLCAddress_;
    Variant PLCFunction_;
    VbArray<int16_t> DataInt_{0, 255};
    VbArray<std::string> PollCommand_;  // not dimensioned until the first command
    int32_t PollIndex_ = 0;
    IntechCollector collector_;
    bool unloaded_ = false;
    // The device of the port, as last opened.
    std::string endpoint_;
    Subscription tick_;
    Subscription comm_;
    Subscription broken_;
};

}  // namespace maroset
