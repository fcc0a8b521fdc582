#include "drivers/df1/FrmNUVProSerial.h"

#include "core/Crc16Arc.h"
#include "core/EventProcedure.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "lang/Conversions.h"
#include "platform/LinkText.h"

namespace maroset {

namespace {

constexpr const char* kModule = "FrmNUVProSerial";
constexpr uint8_t DLE = Df1Receiver::DLE, ETX = Df1Receiver::ETX, ENQ = Df1Receiver::ENQ,
                  ACK = Df1Receiver::ACK, NAK = Df1Receiver::NAK;
// The link's internal event codes.
constexpr int16_t kNothing = 100, kTimeOut = 101, kFrame = 102;

using platform::IncidentKind;

// Received bytes kept for one incident at most: more than the longest frame, even with every
// byte doubled. A longer run (garbage, an endless frame) is told once and counted, not kept.
constexpr size_t kTraceChunk = 1100;

std::string bytes(std::initializer_list<uint8_t> list) {
    return std::string(list.begin(), list.end());
}

}  // namespace

FrmNUVProSerial::FrmNUVProSerial(std::string nodeName)
    : TmrScanRate(Runtime::current().loop()),
      TmrCommsTimeOut(Runtime::current().loop()),
      TmrEndOfMessage(Runtime::current().loop()),
      TmrWatchDog(Runtime::current().loop()),
      nodeName_(std::move(nodeName)),
      rx_(15),
      port_(Runtime::current().serialDevices(), [name = nodeName_](int16_t port) {
          return Runtime::current().serialDevice(port, name);
      }) {
    dataInt_.ReDim(0, 0);
    txBuffer_.ReDim(0, 15);
    TmrScanRate.Interval(2000);
    TmrCommsTimeOut.Interval(1000);
    TmrEndOfMessage.Interval(15);
    TmrWatchDog.Interval(5000);
    TmrWatchDog.Enabled(true);  // from creation on, never stopped

    onComm_ = port_.OnComm.subscribe([this] { fromLoop([this] { MSComm1_OnComm(); }); });
    broken_ = port_.Broken.subscribe([this](const std::string& why) {
        incident(IncidentKind::Closed, [&] { return "line broken: " + why; });
    });
    scanTick_ = TmrScanRate.Tick.subscribe([this] { fromLoop([this] { TmrScanRate_Timer(); }); });
    timeOutTick_ =
        TmrCommsTimeOut.Tick.subscribe([this] { fromLoop([this] { TmrCommsTimeOut_Timer(); }); });
    endTick_ =
        TmrEndOfMessage.Tick.subscribe([this] { fromLoop([this] { TmrEndOfMessage_Timer(); }); });
    watchTick_ = TmrWatchDog.Tick.subscribe([this] { fromLoop([this] { TmrWatchDog_Timer(); }); });
}

FrmNUVProSerial::~FrmNUVProSerial() {
    life_.reset();
    TmrScanRate.Enabled(false);
    TmrCommsTimeOut.Enabled(false);
    TmrEndOfMessage.Enabled(false);
    TmrWatchDog.Enabled(false);
    try {
        port_.PortOpen(false);
    } catch (...) {
        // Closing never fails in a way anyone could act on here.
    }
}

template <class Body>
void FrmNUVProSerial::fromLoop(Body&& body) {
    // Copies: the body may destroy this owner, and the names with it.
    const std::string source = nodeName_;
    const std::string endpoint = endpoint_;
    RunEventProcedure(source, std::forward<Body>(body), endpoint);
}

void FrmNUVProSerial::incident(IncidentKind kind,
                               const platform::LinkIncident::TextSource& text) const {
    Runtime::current().incidents().report(nodeName_, kind, endpoint_, text);
}

void FrmNUVProSerial::tellReceived(IncidentKind kind, std::string_view what) {
    if (traced_.empty() && tracedOver_ == 0) return;
    incident(kind, [&] {
        std::string text = std::string(what) + platform::Hex(traced_);
        if (tracedOver_ > 0) text += " (and " + std::to_string(tracedOver_) + " bytes not kept)";
        return text;
    });
    traced_.clear();
    tracedOver_ = 0;
}

// ---- Properties -----------------------------------------------------------------------------

int16_t FrmNUVProSerial::CommPort() const {
    return port_.CommPort();
}

void FrmNUVProSerial::CommPort(int16_t port) {
    Procedure proc(kModule, "CommPort");
    proc.run([&] { port_.CommPort(port); });
}

std::string FrmNUVProSerial::CommSettings() const {
    return port_.Settings();
}

void FrmNUVProSerial::CommSettings(const std::string& text) {
    Procedure proc(kModule, "CommSettings");
    proc.run([&] { port_.Settings(text); });
}

void FrmNUVProSerial::PLCAddress(const Variant& address) {
    Procedure proc(kModule, "PLCAddress");
    proc.run([&] { plcAddress_ = address; });
    proc.run([&] { CheckAddress(); });
}

void FrmNUVProSerial::PLCWordCount(uint8_t words) {
    Procedure proc(kModule, "PLCWordCount");
    proc.run([&] { plcWordCount_ = words; });
    const auto limit = static_cast<int16_t>(2 * words + 15);
    proc.run([&] { dataInt_.ReDim(0, words); });
    proc.run([&] { rx_.Resize(limit); });
    proc.run([&] { txBuffer_.ReDim(0, limit); });
}

int32_t FrmNUVProSerial::CommTimeOut() const {
    return TmrCommsTimeOut.Interval();
}

void FrmNUVProSerial::CommTimeOut(int32_t ms) {
    Procedure proc(kModule, "CommTimeOut");
    proc.run([&] { TmrCommsTimeOut.Interval(ms); });
}

int16_t FrmNUVProSerial::DataInt(int32_t index) const {
    return dataInt_(index);
}

void FrmNUVProSerial::DataInt(int32_t index, int16_t value) {
    Procedure proc(kModule, "DataInt");
    proc.run([&] { dataInt_(index) = value; });
}

// ---- Byte helpers and CRC -------------------------------------------------------------------

int16_t FrmNUVProSerial::BytesToWord(uint8_t low, uint8_t high) {
    int32_t w = high * 256 + low;
    if (w & 0x8000) w = (w & 0x7FFF) - 32768;
    return static_cast<int16_t>(w);
}

uint8_t FrmNUVProSerial::WordToByte(int32_t word, bool high) {
    return high ? static_cast<uint8_t>((word & 0xFF00) >> 8) : static_cast<uint8_t>(word & 0xFF);
}

uint16_t FrmNUVProSerial::CRCThisByte(uint8_t byte, uint16_t crc) {
    return crc16arc::Fold(byte, crc);
}

void FrmNUVProSerial::CalcCRC(int16_t length, bool fromReceive) {
    // Over the unstuffed body and the ETX: never DLE STX, the DLE before ETX or doubled DLEs.
    uint16_t crc = 0;
    const VbArray<uint8_t>& buffer = fromReceive ? rx_.RxBuffer : txBuffer_;
    for (int32_t i = 0; i <= length; ++i) crc = CRCThisByte(buffer(i), crc);
    crc = CRCThisByte(ETX, crc);
    crcLow_ = WordToByte(crc, false);
    crcHigh_ = WordToByte(crc, true);
}

// ---- Sending --------------------------------------------------------------------------------

void FrmNUVProSerial::openPort() {
    endpoint_ = port_.DeviceName();
    try {
        port_.PortOpen(true);
    } catch (const VbError& e) {
        incident(IncidentKind::OpenFailed, [&] {
            return "cannot open port " + std::to_string(port_.CommPort()) + ": " + e.description();
        });
        throw;
    }
    incident(IncidentKind::Opened, [&] {
        return "opened port " + std::to_string(port_.CommPort()) + " (" + endpoint_ + ", " +
               port_.Settings() + ")";
    });
}

void FrmNUVProSerial::write(std::string_view data) {
    if (port_.Output(data)) {
        incident(IncidentKind::Sent, [&] { return "sent " + platform::Hex(data); });
        return;
    }
    // Lost as a frame the PLC never answered: the link's time-out and retries take over.
    incident(IncidentKind::Dropped, [&] {
        return "not sent, " + endpoint_ +
               " takes no output (its queue is full): " + platform::Hex(data);
    });
}

bool FrmNUVProSerial::raiseComplete(const std::string& text, uint8_t level, IncidentKind kind) {
    const std::weak_ptr<int> life = life_;
    incident(kind, [&] { return "Complete level " + std::to_string(level) + ": " + text; });
    Complete.raise(text, level);
    return !life.expired();
}

void FrmNUVProSerial::SendMessage() {
    Procedure proc(kModule, "SendMessage");
    proc.run([&] { awaitingReply_ = true; });
    proc.run([&] { TmrCommsTimeOut.Enabled(true); });
    // The frame goes out in one write: header, body with every DLE doubled, trailer.
    proc.run([&] {
        std::string frame = txHeader_;
        frame.reserve(txHeader_.size() + 2 * (txLast_ + 1) + txTrailer_.size());
        for (int32_t i = 0; i <= txLast_; ++i) {
            const uint8_t b = txBuffer_(i);
            frame += static_cast<char>(b);
            if (b == DLE) frame += static_cast<char>(DLE);
        }
        frame += txTrailer_;
        write(frame);
    });
}

void FrmNUVProSerial::Transmiter(int16_t code) {
    const std::weak_ptr<int> life = life_;
    Procedure proc(kModule, "Transmiter");
    if (!awaitingReply_ || code == kNothing) return;
    switch (code) {
        case ACK:
            proc.run([&] { awaitingReply_ = false; });
            proc.run([&] { TmrCommsTimeOut.Enabled(false); });
            break;
        case NAK:
            proc.run([&] { ++nakRetries_; });
            if (nakRetries_ < 4) {
                proc.run([&] { SendMessage(); });
                proc.run([&] {
                    raiseComplete("Receivied NAK - Resending Message", 4, IncidentKind::Retried);
                });
            } else {
                proc.run([&] { busy_ = false; });
                proc.run([&] {
                    raiseComplete("Receivied NAK - Aborting message", 4, IncidentKind::Dropped);
                });
                if (life.expired()) return;
                proc.run([&] { awaitingReply_ = false; });
                proc.run([&] { nakRetries_ = 0; });
            }
            break;
        case kTimeOut:
            proc.run([&] { ++noReplyRetries_; });
            if (noReplyRetries_ < 4) {
                // Only an inquiry: the frame is not sent again, and the time-out keeps running.
                proc.run([&] { write(bytes({DLE, ENQ})); });
                proc.run([&] {
                    raiseComplete("No Responce - Resending Message", 4, IncidentKind::Retried);
                });
            } else {
                proc.run([&] { busy_ = false; });
                proc.run(
                    [&] { raiseComplete("No Responce - Timed out", 4, IncidentKind::TimedOut); });
                if (life.expired()) return;
                proc.run([&] { noReplyRetries_ = 0; });
                proc.run([&] { awaitingReply_ = false; });
                proc.run([&] { TmrCommsTimeOut.Enabled(false); });
            }
            break;
        default:
            break;
    }
}

// ---- Receiving ------------------------------------------------------------------------------

void FrmNUVProSerial::MSComm1_OnComm() {
    Procedure proc(kModule, "MSComm1_OnComm");
    proc.run([&] {
        TmrWatchDog.Enabled(false);
        TmrWatchDog.Enabled(true);
    });
    std::string in;
    proc.run([&] { in = port_.Input(); });
    if (in.empty()) return;
    step(static_cast<uint8_t>(in[0]), proc);
}

void FrmNUVProSerial::feed(uint8_t byte) {
    Procedure proc(kModule, "MSComm1_OnComm");
    step(byte, proc);
}

void FrmNUVProSerial::step(uint8_t cur, Procedure& proc) {
    if (traced_.size() < kTraceChunk) {
        traced_ += static_cast<char>(cur);
    } else if (tracedOver_++ == 0) {
        incident(IncidentKind::Note, [] {
            return "receiving more than " + std::to_string(kTraceChunk) +
                   " bytes with no frame end: counted, not kept";
        });
    }
    rx_.feed(cur, *this, proc);
}

void FrmNUVProSerial::restartEndOfMessage() {
    TmrEndOfMessage.Enabled(false);
    TmrEndOfMessage.Enabled(true);
}

void FrmNUVProSerial::stopEndOfMessage() {
    TmrEndOfMessage.Enabled(false);
}

bool FrmNUVProSerial::frameReceived() {
    const std::weak_ptr<int> life = life_;
    tellReceived(IncidentKind::Received, "received ");
    Receiver(kFrame);
    return !life.expired();
}

bool FrmNUVProSerial::controlReceived(uint8_t code) {
    const std::weak_ptr<int> life = life_;
    tellReceived(IncidentKind::Received, "received ");
    if (code == ENQ)
        Receiver(ENQ);
    else
        Transmiter(code);
    return !life.expired();
}

void FrmNUVProSerial::frameStarted() {
    // Whatever came before DLE STX did not belong to a frame.
    if (traced_.size() > 2) {
        const std::string start = traced_.substr(traced_.size() - 2);
        traced_.resize(traced_.size() - 2);
        tellReceived(IncidentKind::Dropped, "received (no frame) ");
        traced_ = start;
    }
}

void FrmNUVProSerial::Receiver(int16_t code) {
    Procedure proc(kModule, "Receiver");
    proc.run([&] {
        if (!port_.PortOpen()) openPort();
    });
    proc.run([&] {
        if (lastReply_ == 0) lastReply_ = NAK;
    });
    if (code == kFrame) {
        const int16_t count = rx_.RxCount;
        proc.run([&] { CalcCRC(static_cast<int16_t>(count - 5), true); });
        bool bad = false;
        proc.run([&] {
            bad = rx_.RxBuffer(count - 2) != crcLow_ || rx_.RxBuffer(count - 1) != crcHigh_;
        });
        if (bad) {
            proc.run([&] { write(bytes({DLE, NAK})); });
            proc.run([&] {
                statusText_ = " ";
                for (int32_t i = 0; i <= count; ++i)
                    statusText_ += std::to_string(rx_.RxBuffer(i)) + "x";
            });
            const std::weak_ptr<int> life = life_;
            proc.run([&] {
                raiseComplete("Received Bad CRC " + statusText_, 3, IncidentKind::BadCheck);
            });
            if (life.expired()) return;
            proc.run([&] { lastReply_ = NAK; });
            return;
        }
        proc.run([&] { write(bytes({DLE, ACK})); });
        proc.run([&] { lastReply_ = ACK; });
        proc.run([&] { busy_ = false; });
        decodeReply(proc);
    } else if (code == ENQ) {
        proc.run([&] { write(bytes({DLE, lastReply_})); });
        proc.run([&] {
            raiseComplete("Received ENQ Responce: " + std::to_string(lastReply_), 3,
                          IncidentKind::Note);
        });
    } else {
        proc.run([&] { lastReply_ = NAK; });
    }
}

void FrmNUVProSerial::decodeReply(Procedure& proc) {
    bool isRead = false;
    // Only the command byte is looked at: an error reply without data decodes like data.
    proc.run([&] {
        isRead = Compare(plcFunction_, Variant(int16_t{1})) == Ordering::Equal &&
                 rx_.RxBuffer(2) == 0x4F;
    });
    if (!isRead) return;
    VbArray<Variant> values;
    proc.run([&] { values.ReDim(0, plcWordCount_); });
    for (int32_t i = 0; i < plcWordCount_; ++i) {
        proc.run([&] {
            const int16_t word = BytesToWord(rx_.RxBuffer(6 + 2 * i), rx_.RxBuffer(7 + 2 * i));
            dataInt_(i) = word;
            values(i) = Variant(word);
        });
    }
    proc.run([&] { ReadComplete.raise(values); });
}

// ---- Timers ---------------------------------------------------------------------------------

void FrmNUVProSerial::TmrScanRate_Timer() {
    Procedure proc(kModule, "TmrScanRate_Timer");
    proc.run([&] { PollTime.raise(); });
}

void FrmNUVProSerial::TmrCommsTimeOut_Timer() {
    Procedure proc(kModule, "TmrCommsTimeOut_Timer");
    proc.run([&] { Transmiter(kTimeOut); });
}

void FrmNUVProSerial::TmrEndOfMessage_Timer() {
    Procedure proc(kModule, "TmrEndOfMessage_Timer");
    if (rx_.InMessage)
        tellReceived(IncidentKind::Dropped, "dropped a partial frame (gap over 15 ms): ");
    proc.run([&] { rx_.InMessage = false; });
    proc.run([&] { TmrEndOfMessage.Enabled(false); });
}

void FrmNUVProSerial::TmrWatchDog_Timer() {
    Procedure proc(kModule, "TmrWatchDog_Timer");
    if (!busy_) return;
    proc.run([&] { busy_ = false; });
    proc.run([&] { raiseComplete("WatchDog Timeout", 4, IncidentKind::TimedOut); });
}

}  // namespace maroset
