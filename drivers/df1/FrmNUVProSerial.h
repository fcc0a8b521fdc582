#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "drivers/df1/Df1Receiver.h"
#include "lang/Event.h"
#include "lang/Subscription.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"
#include "platform/LinkIncident.h"
#include "platform/Timer.h"
#include "platform/serial/SerialPort.h"

namespace maroset {

// The hidden port owner of the DF1 driver: one serial port to one Allen-Bradley PLC, spoken
// to in DF1 full duplex (DLE STX body DLE ETX, CRC-16 low then high, data DLEs doubled), and
// the four timers of the link. One request is outstanding at a time.
//
// Link (see the DF1 protocol manual for the framing):
// - RefreshData builds a protected typed logical read (FNC 0xA2) or write (0xAA) of
//   PLCWordCount words at PLCAddress and sends it. A poll while a frame is still unanswered
//   ("Missed poll Tx") or a reply is still arriving ("Missed poll Rx") clears that flag
//   instead and sends nothing.
// - DLE NAK: the frame is resent up to three times, the fourth NAK aborts it. No DLE ACK
//   within CommTimeOut: DLE ENQ up to three times, one CommTimeOut apart, then it gives up.
//   Neither retry count is reset by a success: retries count across requests until one
//   request is given up that way. This is intended.
// - A reply frame whose CRC is wrong is answered DLE NAK, a good one DLE ACK, then decoded:
//   a read reply (CMD 0x4F) raises ReadComplete with its words. STS and TNS are not looked at.
// - DLE ENQ from the PLC is answered with DLE and the last reply sent (NAK before any).
// - A gap of more than 15 ms inside a frame drops it silently. Five seconds without a byte
//   while Busy clear Busy ("WatchDog Timeout").
// Link incidents are raised as Complete(text, level) with the texts below, spelling
// included; they are also told on the runtime's link incidents under the node's name, at the
// port's device, with every byte string sent and every frame received.
//
// The port is opened on demand before every request, so a device that was missing or
// unplugged is reached again by the next request. Every procedure runs under the error
// trap with the module name "FrmNUVProSerial"; an error that leaves a timer tick or a
// receive event is traced and dropped.
//
// Event handlers may destroy the owner; the owner never touches itself after raising an
// event that did so.
class FrmNUVProSerial final : private Df1Receiver::Link {
  public:
    // nodeName picks the node's own port mapping and names the trace lines.
    explicit FrmNUVProSerial(std::string nodeName);
    ~FrmNUVProSerial();
    FrmNUVProSerial(const FrmNUVProSerial&) = delete;
    FrmNUVProSerial& operator=(const FrmNUVProSerial&) = delete;

    // Properties.
    int16_t CommPort() const;
    void CommPort(int16_t port);
    std::string CommSettings() const;
    void CommSettings(const std::string& text);
    const Variant& PLCAddress() const { return plcAddress_; }
    // Runs CheckAddress; its answer is not kept.
    void PLCAddress(const Variant& address);
    uint8_t PLCNode() const { return plcNode_; }
    void PLCNode(uint8_t node) { plcNode_ = node; }
    // Stored only: the SRC byte sent is always 0.
    uint8_t PCNode() const { return pcNode_; }
    void PCNode(uint8_t node) { pcNode_ = node; }
    uint8_t PLCWordCount() const { return plcWordCount_; }
    // Re-dimensions DataInt to 0..n and both byte buffers to 0..2n+15, clearing them.
    void PLCWordCount(uint8_t words);
    const Variant& PLCFunction() const { return plcFunction_; }
    void PLCFunction(const Variant& function) { plcFunction_ = function; }
    const std::string& ErrorCheckMode() const { return errorCheckMode_; }
    void ErrorCheckMode(const std::string& mode) { errorCheckMode_ = mode; }
    int32_t CommTimeOut() const;
    void CommTimeOut(int32_t ms);
    bool Busy() const { return busy_; }
    int16_t DataInt(int32_t index) const;
    void DataInt(int32_t index, int16_t value);

    // Empty for a good data-table address, "Invalid PLC Address" otherwise; the parsed fields
    // stay set either way. Text that has no colon, or letters where digits belong, fails
    // with the conversion's run-time error.
    Variant CheckAddress();
    // Builds one request for PLCFunction (1 read, 2 write) and sends it; any other function
    // sends the request built last.
    void RefreshData();

    static int16_t BytesToWord(uint8_t low, uint8_t high);
    static uint8_t WordToByte(int32_t word, bool high);

    // Events.
    Event<std::string, uint8_t> Complete;   // text, level 3 or 4
    Event<VbArray<Variant>&> ReadComplete;  // values 0..PLCWordCount
    Event<> PollTime;

    platform::Timer TmrScanRate;
    platform::Timer TmrCommsTimeOut;
    platform::Timer TmrEndOfMessage;
    platform::Timer TmrWatchDog;

    // What CheckAddress parsed, and the request numbering.
    const std::string& FileType() const { return fileType_; }
    int16_t FileNumber() const { return fileNumber_; }
    const std::string& ElementText() const { return elementText_; }
    const std::string& SubElementText() const { return subElementText_; }
    const std::string& FileTypeCode() const { return fileTypeCode_; }
    int16_t TransactionNumber() const { return transactionNumber_; }
    void TransactionNumber(int16_t tns) { transactionNumber_ = tns; }

    // Link state, for hosts and tests that watch the line.
    bool AwaitingReply() const { return awaitingReply_; }
    uint8_t LastReply() const { return lastReply_; }
    uint8_t NakRetries() const { return nakRetries_; }
    uint8_t NoReplyRetries() const { return noReplyRetries_; }
    const Df1Receiver& receiver() const { return rx_; }
    platform::SerialPort& port() { return port_; }

    // Steps one received byte as a receive event does (after the watchdog restart): the
    // entry point the port's receive event, tests and fuzzers share.
    void feed(uint8_t byte);

  private:
    // The link's procedures.
    void SendMessage();
    void Transmiter(int16_t code);
    void Receiver(int16_t code);
    void MSComm1_OnComm();
    void CalcCRC(int16_t length, bool fromReceive);
    static uint16_t CRCThisByte(uint8_t byte, uint16_t crc);
    void TmrScanRate_Timer();
    void TmrCommsTimeOut_Timer();
    void TmrEndOfMessage_Timer();
    void TmrWatchDog_Timer();

    // The reply decoder of a frame that passed its check.
    void decodeReply(Procedure& proc);
    // Steps one byte through the receiver, noting it for the trace.
    void step(uint8_t byte, Procedure& proc);
    // Tells the incident, then raises Complete; false when the owner is gone afterwards.
    bool raiseComplete(const std::string& text, uint8_t level, platform::IncidentKind kind);
    void write(std::string_view bytes);
    void openPort();
    // Runs a handler the loop called, so that nothing escapes into the loop.
    template <class Body>
    void fromLoop(Body&& body);
    void incident(platform::IncidentKind kind,
                  const platform::LinkIncident::TextSource& text) const;
    // Tells the bytes received since the last incident about them, and forgets them.
    void tellReceived(platform::IncidentKind kind, std::string_view what);

    // Df1Receiver::Link
    void restartEndOfMessage() override;
    void stopEndOfMessage() override;
    bool frameReceived() override;
    bool controlReceived(uint8_t code) override;
    void frameStarted() override;

    std::string nodeName_;
    // Expires when the owner is destroyed: procedures test it after raising events.
    std::shared_ptr<int> life_ = std::make_shared<int>(0);

    Variant plcAddress_;
    uint8_t plcNode_ = 0;
    uint8_t pcNode_ = 0;
    uint8_t plcWordCount_ = 0;
    Variant plcFunction_;
    std::string errorCheckMode_;
    VbArray<int16_t> dataInt_;

    std::string fileType_;
    int16_t fileNumber_ = 0;
    std::string elementText_;
    std::string subElementText_;
    std::string fileTypeCode_;
    int16_t transactionNumber_ = 0;

    bool busy_ = false;
    bool awaitingReply_ = false;
    uint8_t lastReply_ = 0;
    uint8_t nakRetries_ = 0;
    uint8_t noReplyRetries_ = 0;
    Df1Receiver rx_;
    VbArray<uint8_t> txBuffer_;
    int16_t txLast_ = 0;
    std::string txHeader_;
    std::string txTrailer_;
    uint8_t crcLow_ = 0;
    uint8_t crcHigh_ = 0;
    std::string statusText_;
    // The bytes received since the last incident about them, and how many more were counted
    // beyond what is kept.
    std::string traced_;
    int64_t tracedOver_ = 0;
    // The device of the port, as last opened.
    std::string endpoint_;

    platform::SerialPort port_;
    Subscription onComm_, broken_, scanTick_, timeOutTick_, endTick_, watchTick_;
};

}  // namespace maroset
