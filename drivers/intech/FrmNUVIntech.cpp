#include "drivers/intech/FrmNUVIntech.h"

#include <cstring>

#include "core/EventProcedure.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "lang/Conversions.h"
#include "lang/Format.h"
#include "lang/Strings.h"
#include "platform/LinkText.h"

namespace maroset {

namespace {

constexpr const char* kModule = "FrmNUVIntech";

using platform::IncidentKind;
constexpr char kHexDigits[] = "0123456789ABCDEF";

int hexDigit(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    return -1;
}

// Hexadecimal digits as an unsigned number; anything else (no digits at all included) is a
// Type mismatch, as the instrument's data is read with the language's "&H" conversion.
uint32_t hexValue(std::string_view digits) {
    if (digits.empty()) throw VbError(err::TypeMismatch);
    uint32_t value = 0;
    for (const char c : digits) {
        const int d = hexDigit(c);
        if (d < 0) throw VbError(err::TypeMismatch);
        value = value * 16 + static_cast<uint32_t>(d);
    }
    return value;
}

}  // namespace

FrmNUVIntech::FrmNUVIntech()
    : TmrScanRate(Runtime::current().loop()),
      TmrCommsTimeOut(Runtime::current().loop()),
      TmrEndOfMessage(Runtime::current().loop()),
      TmrWatchDog(Runtime::current().loop()),
      MSComm1(Runtime::current().serialDevices(),
              [this](int16_t port) { return Runtime::current().serialDevice(port, NodeName_); }) {
    // One receive event per character, one character per read: the collector compares what
    // each read returns with single characters.
    MSComm1.RThreshold(1);
    MSComm1.InputLen(1);
    tick_ = TmrScanRate.Tick.subscribe([this] { onTick(); });
    comm_ = MSComm1.OnComm.subscribe([this] { onComm(); });
    broken_ = MSComm1.Broken.subscribe([this](const std::string& why) {
        // The port closed itself; the next send opens it again.
        incident(IncidentKind::Closed, [&] { return "line broken: " + why; });
    });
}

FrmNUVIntech::~FrmNUVIntech() = default;

void FrmNUVIntech::CommPort(int16_t port) {
    Procedure proc(kModule, "CommPort");
    proc.run([&] { MSComm1.CommPort(port); });
}

void FrmNUVIntech::CommSettings(const std::string& settings) {
    Procedure proc(kModule, "CommSettings");
    proc.run([&] { MSComm1.Settings(settings); });
}

void FrmNUVIntech::CommTimeOut(int32_t ms) {
    Procedure proc(kModule, "CommTimeOut");
    proc.run([&] { TmrCommsTimeOut.Interval(ms); });
}

void FrmNUVIntech::Busy(int16_t) {
    Procedure proc(kModule, "Busy");
    // The property is read-only; at run time the control says so with 382.
    proc.run([] { throw VbError(err::SetNotSupportedAtRunTime); });
}

std::string FrmNUVIntech::PollCommand(int32_t index) {
    Procedure proc(kModule, "PollCommand");
    std::string command;
    proc.run([&] {
        if (index > PollCommand_.UBound()) PollCommand_.ReDimPreserve(index);
        command = PollCommand_(index);
    });
    return command;
}

void FrmNUVIntech::PollCommand(int32_t index, const std::string& command) {
    Procedure proc(kModule, "PollCommand");
    proc.run([&] {
        if (index > PollCommand_.UBound()) PollCommand_.ReDimPreserve(index);
        PollCommand_(index) = command;
    });
}

std::string FrmNUVIntech::CalcBCC(std::string_view s) {
    Procedure proc(kModule, "CalcBCC");
    unsigned sum = 0;
    proc.run([&] {
        for (size_t i = 1; i < s.size(); ++i) sum = (sum + static_cast<unsigned char>(s[i])) & 255;
    });
    std::string bcc;
    proc.run([&] {
        if (sum >= 16) bcc += kHexDigits[sum >> 4];
        bcc += kHexDigits[sum & 15];
    });
    return bcc;
}

float FrmNUVIntech::HexToSingle(std::string_view s) {
    Procedure proc(kModule, "HexToSingle");
    float result = 0;
    proc.run([&] {
        if (s.size() != 8) return;
        // Characters 1-2 are the most significant byte, which sits highest in memory.
        unsigned char bytes[4];
        bytes[0] = static_cast<unsigned char>(hexValue(s.substr(6, 2)));
        bytes[1] = static_cast<unsigned char>(hexValue(s.substr(4, 2)));
        bytes[2] = static_cast<unsigned char>(hexValue(s.substr(2, 2)));
        bytes[3] = static_cast<unsigned char>(hexValue(s.substr(0, 2)));
        uint32_t bits = static_cast<uint32_t>(bytes[0]) | static_cast<uint32_t>(bytes[1]) << 8 |
                        static_cast<uint32_t>(bytes[2]) << 16 |
                        static_cast<uint32_t>(bytes[3]) << 24;
        std::memcpy(&result, &bits, sizeof result);
    });
    return result;
}

std::string FrmNUVIntech::SingleToHex(float x) {
    Procedure proc(kModule, "SingleToHex");
    std::string hex;
    proc.run([&] {
        uint32_t bits;
        std::memcpy(&bits, &x, sizeof bits);
        // Lowest byte first: not the order HexToSingle reads, and kept so.
        for (int i = 0; i < 4; ++i) {
            const unsigned b = (bits >> (8 * i)) & 255;
            hex += kHexDigits[b >> 4];
            hex += kHexDigits[b & 15];
        }
    });
    return hex;
}

void FrmNUVIntech::openPort() {
    endpoint_ = MSComm1.DeviceName();
    try {
        MSComm1.PortOpen(true);
    } catch (const VbError& e) {
        // The error itself goes on to the caller.
        incident(IncidentKind::OpenFailed, [&] {
            return "cannot open port " + std::to_string(CommPort()) + ": " + e.description();
        });
        throw;
    }
    incident(IncidentKind::Opened, [&] {
        return "opened port " + std::to_string(CommPort()) + " (" + endpoint_ + ", " +
               MSComm1.Settings() + ")";
    });
}

void FrmNUVIntech::SendCommand(const std::string& cmd) {
    Procedure proc(kModule, "SendCommand");
    std::string bcc;
    proc.run([&] { bcc = CalcBCC(cmd); });
    proc.run([&] {
        if (!MSComm1.PortOpen()) openPort();
    });
    proc.run([&] {
        const std::string request = cmd + bcc + "\r";
        if (collector_.dropped() > 0) traceDropped();
        if (!MSComm1.Output(request)) {
            // Lost as a command the instrument never answered: the next tick goes on.
            incident(IncidentKind::Dropped, [&] {
                return "not sent, " + endpoint_ +
                       " takes no output (its queue is full): " + platform::Printable(request);
            });
            return;
        }
        incident(IncidentKind::Sent, [&] {
            std::string text = "sent " + platform::Printable(request);
            // The list keeps an empty place after a tag whose command it already had.
            if (cmd.empty()) text += " (the poll list's empty entry, sent as the BCC of nothing)";
            return text;
        });
    });
}

void FrmNUVIntech::pollStep(Procedure& proc) {
    std::string cmd;
    if (PollCommand_.UBound() < 0) {
        incident(IncidentKind::Note, [] {
            return std::string(
                "no poll command: the node has no tag, so each tick fails with error 9 until "
                "one is added");
        });
    }
    // The list itself, not the growing accessor: before anything was registered this fails
    // with Subscript out of range and nothing is sent.
    proc.run([&] { cmd = PollCommand_(PollIndex_); });
    proc.run([&] {
        ++PollIndex_;
        if (PollIndex_ > PollCommand_.UBound()) PollIndex_ = 0;
    });
    // An empty entry goes out too, as "0" and a carriage return.
    proc.run([&] { SendCommand(cmd); });
}

void FrmNUVIntech::TmrScanRate_Timer() {
    Procedure proc(kModule, "TmrScanRate_Timer");
    pollStep(proc);
}

void FrmNUVIntech::SendNextCommand() {
    Procedure proc(kModule, "SendNextCommand");
    bool wrapped = false;
    proc.run([&] { wrapped = PollIndex_ == 0; });
    if (wrapped) return;  // the cycle is done; the next one waits for the tick
    pollStep(proc);
}

void FrmNUVIntech::onTick() {
    const auto self = weak_from_this().lock();
    if (unloaded_) return;
    const std::string source(traceSource());
    const std::string endpoint = endpoint_;
    RunEventProcedure(
        source, [&] { TmrScanRate_Timer(); }, endpoint);
}

void FrmNUVIntech::onComm() {
    const auto self = weak_from_this().lock();
    if (unloaded_) return;
    const std::string source(traceSource());
    const std::string endpoint = endpoint_;
    RunEventProcedure(
        source, [&] { MSComm1_OnComm(); }, endpoint);
}

void FrmNUVIntech::MSComm1_OnComm() {
    Procedure proc(kModule, "MSComm1_OnComm");
    std::string c;
    bool complete = false;
    proc.run([&] { c = MSComm1.Input(); });
    proc.run([&] {
        if (c == "@" && collector_.dropped() > 0) traceDropped();
        complete = collector_.feed(c);
    });
    if (!collector_.cutShort().empty()) {
        incident(IncidentKind::Dropped, [&] {
            return "reply cut short by a new \"@\" after " +
                   std::to_string(collector_.cutShort().size()) +
                   " characters: " + platform::Printable(collector_.cutShort());
        });
        collector_.takeCutShort();
    }
    if (collector_.overran()) {
        incident(IncidentKind::Dropped, [] {
            return "reply longer than " + std::to_string(IntechCollector::FrameLimit) +
                   " characters: dropped, waiting for the next \"@\"";
        });
        collector_.takeOverrun();
    }
    if (!complete) return;
    proc.run([&] {
        // A copy: a handler further down may release this object and its buffer.
        const std::string frame = collector_.RxBuffer();
        incident(IncidentKind::Received, [&] { return "received " + platform::Printable(frame); });
        RXData(frame);
    });
}

bool FrmNUVIntech::acceptFrame(const std::string& frame) const {
    auto reject = [&](const std::string& why) {
        incident(IncidentKind::BadCheck, [&] { return "dropped reply: " + why; });
        return false;
    };
    const size_t length = frame.size();
    if (length < 8)
        return reject("too short (" + std::to_string(length) + " characters, at least 8)");
    if (frame[0] != '@') return reject("no \"@\" at the start");
    if (frame[length - 3] != ':') return reject("no \":\" third from the end");
    const std::string computed = CalcBCC(std::string_view(frame).substr(0, length - 2));
    const std::string received = frame.substr(length - 2);
    if (computed != received) {
        std::string why = "BCC mismatch (computed " + platform::Printable(computed) +
                          ", received " + platform::Printable(received);
        if (computed.size() == 1) why += "; a sum below 16 never matches";
        return reject(why + ")");
    }
    return true;
}

bool FrmNUVIntech::decode(const std::string& block, const std::string& body,
                          const std::string& address, VbArray<Variant>& names,
                          VbArray<Variant>& values) const {
    if (block == "DI") {
        const int16_t outputs = CInt(Variant(Mid(body, 10, 4)));
        const int16_t inputs = CInt(Variant(Mid(body, 15, 4)));
        names.ReDim(0, 5);
        values.ReDim(0, 5);
        names(0) = Variant(address + "LDO1");
        names(1) = Variant(address + "LDO2");
        values(0) = Variant(static_cast<int16_t>(outputs & 1));
        values(1) = Variant(static_cast<int16_t>(outputs & 2));
        // The masked bits themselves: LDI3 is 0 or 4, LDI4 0 or 8. Intended.
        for (int16_t bit = 0; bit < 4; ++bit) {
            names(2 + bit) = Variant(address + "LDI" + std::to_string(bit + 1));
            values(2 + bit) = Variant(static_cast<int16_t>(inputs & (1 << bit)));
        }
        return true;
    }
    if (block == "E1" || block == "E2" || block == "E3" || block == "E4") {
        const int32_t base = (CInt(Variant(Mid(body, 8, 1))) - 1) * 16;
        names.ReDim(0, 15);
        values.ReDim(0, 15);
        for (int32_t k = 0; k <= 15; ++k) {
            names(k) = Variant(address + "EAI" + std::to_string(base + k + 1));
            const uint32_t raw = hexValue(Mid(body, 10 + 4 * k, 3));
            values(k) = Variant(Format(Variant(static_cast<int32_t>(raw)), "###0"));
        }
        return true;
    }
    if (block == "E5") {
        const int32_t base = CInt(Variant(Mid(body, 10, 2))) * 4;
        names.ReDim(0, 3);
        values.ReDim(0, 3);
        for (int32_t k = 0; k <= 3; ++k) {
            names(k) = Variant(address + "LAI" + std::to_string(base + k + 1));
            values(k) = Variant(Format(Variant(HexToSingle(Mid(body, 13 + 9 * k, 8))), "###0.0"));
        }
        return true;
    }
    // "E6" and anything else carries nothing this driver reports.
    incident(IncidentKind::Note,
             [&] { return "block \"" + platform::Printable(block) + "\": nothing reported"; });
    return false;
}

void FrmNUVIntech::RXData(const std::string& frame) {
    Procedure proc(kModule, "RXData");
    bool accepted = false;
    proc.run([&] { accepted = acceptFrame(frame); });
    if (!accepted) return;

    std::string body, address, code, block;
    proc.run([&] {
        body = Left(frame, static_cast<int32_t>(frame.size()) - 2);
        address = Mid(frame, 2, 2);
        code = Mid(body, 4, 2);
        block = Mid(body, 7, 2);
    });
    if (code == "EX") {
        VbArray<Variant> names, values;
        bool decoded = false;
        proc.run([&] { decoded = decode(block, body, address, names, values); });
        if (decoded) {
            proc.run([&] { ReadComplete.raise(names, values); });
            if (unloaded_) return;  // released by a handler: nothing more goes out
        }
    } else if (code != "OK") {
        // Not an answer this driver knows: the chain stops until the next tick.
        incident(IncidentKind::Refused, [&] {
            return "reply code \"" + platform::Printable(code) +
                   "\" unknown: polling waits for the next tick";
        });
        return;
    }
    proc.run([&] { SendNextCommand(); });
}

void FrmNUVIntech::Unload() {
    unloaded_ = true;
    TmrScanRate.Enabled(false);
    TmrCommsTimeOut.Enabled(false);
    TmrEndOfMessage.Enabled(false);
    TmrWatchDog.Enabled(false);
    if (MSComm1.PortOpen()) MSComm1.PortOpen(false);
}

std::string_view FrmNUVIntech::traceSource() const {
    return NodeName_.empty() ? std::string_view(Caption) : std::string_view(NodeName_);
}

void FrmNUVIntech::incident(IncidentKind kind, std::string_view tag,
                            const platform::LinkIncident::TextSource& text) const {
    Runtime::current().incidents().report(traceSource(), kind, endpoint_, tag, text);
}

void FrmNUVIntech::traceDropped() {
    incident(IncidentKind::Dropped, [&] {
        std::string text =
            "dropped " + std::to_string(collector_.dropped()) +
            " characters outside a frame: " + platform::Printable(collector_.droppedSample());
        if (collector_.dropped() > static_cast<int64_t>(collector_.droppedSample().size()))
            text += "...";
        return text;
    });
    collector_.takeDropped();
}

}  // namespace maroset
