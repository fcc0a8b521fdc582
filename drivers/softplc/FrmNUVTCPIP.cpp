#include "drivers/softplc/FrmNUVTCPIP.h"

#include "core/EventProcedure.h"
#include "core/Procedure.h"
#include "core/Runtime.h"
#include "drivers/softplc/ArrivalSplitter.h"
#include "drivers/softplc/ConcatText.h"
#include "lang/Format.h"
#include "lang/Strings.h"
#include "platform/LinkText.h"

namespace maroset {

namespace {

constexpr const char* kModule = "FrmCommClient";

using platform::IncidentKind;
using platform::TcpClient;

std::string keyOf(int32_t number) {
    return "KEY" + Format(Variant(number), "000");
}

}  // namespace

std::shared_ptr<FrmNUVTCPIP> FrmNUVTCPIP::Create(std::string nodeName) {
    std::shared_ptr<FrmNUVTCPIP> form(new FrmNUVTCPIP(std::move(nodeName)));
    form->hook();
    return form;
}

FrmNUVTCPIP::FrmNUVTCPIP(std::string nodeName)
    : Winsock(Runtime::current().tcp()),
      TmrAckDelay(Runtime::current().loop()),
      nodeName_(std::move(nodeName)) {
    TmrAckDelay.Interval(AckDelayInterval);
    TmrAckDelay.Enabled(true);
}

FrmNUVTCPIP::~FrmNUVTCPIP() = default;

void FrmNUVTCPIP::hook() {
    // Each handler holds the object for its length: a handler further up may release it.
    const std::weak_ptr<FrmNUVTCPIP> weak = weak_from_this();
    auto run = [weak](auto&& body) {
        const auto self = weak.lock();
        if (!self || self->unloaded_) return;
        RunEventProcedure(self->nodeName_, [&] { body(*self); });
    };
    subscriptions_.push_back(
        Winsock.Connected.subscribe([run] { run([](FrmNUVTCPIP& f) { f.Winsock_Connect(); }); }));
    subscriptions_.push_back(Winsock.DataArrival.subscribe([run](int32_t bytesTotal) {
        run([bytesTotal](FrmNUVTCPIP& f) { f.Winsock_DataArrival(bytesTotal); });
    }));
    subscriptions_.push_back(
        Winsock.Closed.subscribe([run] { run([](FrmNUVTCPIP& f) { f.Winsock_Close(); }); }));
    subscriptions_.push_back(
        Winsock.Error.subscribe([run](int16_t number, const std::string& description) {
            run([&](FrmNUVTCPIP& f) { f.Winsock_Error(number, description); });
        }));
    subscriptions_.push_back(
        TmrAckDelay.Tick.subscribe([run] { run([](FrmNUVTCPIP& f) { f.TmrAckDelay_Timer(); }); }));
}

bool FrmNUVTCPIP::connected() const {
    return Winsock.State() == TcpClient::sckConnected;
}

std::string FrmNUVTCPIP::endpoint() const {
    return Winsock.RemoteHost() + ":" + std::to_string(Winsock.RemotePort());
}

void FrmNUVTCPIP::trace(IncidentKind kind, std::string_view words, std::string_view frame) const {
    const std::string where = endpoint();
    Runtime::current().incidents().report(
        nodeName_, kind, where, [&] { return std::string(words) + platform::Printable(frame); });
}

void FrmNUVTCPIP::SendData(const std::string& MsgType, const Variant& data) {
    const auto self = shared_from_this();  // the pump may release the last other reference
    Procedure proc(kModule, "SendData");
    proc.run([&] {
        MSGNum = MSGNum + 1;
        if (MSGNum > 999) MSGNum = 0;
    });
    bool up = true;
    proc.run([&] {
        if (!connected()) {
            up = false;
            WinError("No Server Connection Available");
        }
    });
    if (!up) {
        // The number stays used; the frame is lost.
        trace(IncidentKind::Dropped,
              "No Server Connection Available: not connected to " + endpoint() + ", lost " +
                  MsgType + " frame " + Format(Variant(MSGNum), "000") + ": ",
              ConcatText(data));
        return;
    }
    std::string frame;
    proc.run([&] { frame = MessageFrame::Build(MsgType, MSGNum, ConcatText(data)); });
    if (MsgType != "ACK" && MsgType != "NAK") {
        proc.run([&] {
            TXMessage = std::make_shared<ClsTXMessage>();
            TXMessage->Message = frame;
            TXMessage->MSGNum = MSGNum;
        });
        proc.run([&] { TXQueue.Add(TXMessage, keyOf(MSGNum)); });
        proc.run([&] { TmrAckDelay.Enabled(true); });
        TXMessage.reset();
    }
    proc.run([&] {
        if (connected()) {
            trace(IncidentKind::Sent, "Client Send: ", frame);
            Winsock.SendData(frame);
        }
    });
    // Handlers may run here and change the queue, or unload this object: nothing of it is
    // used after the pump.
    proc.run([&] { Runtime::current().loop().pump(); });
}

void FrmNUVTCPIP::WinError(const std::string&) {
    // Reports nothing: the caller tells what the error cost.
}

void FrmNUVTCPIP::Winsock_Connect() {
    trace(IncidentKind::Opened, "connected99: connected to " + endpoint());
}

void FrmNUVTCPIP::Winsock_DataArrival(int32_t) {
    const auto self = shared_from_this();
    Procedure proc(kModule, "Winsock_DataArrival");
    std::string text;
    proc.run([&] { text = Winsock.GetData(); });
    trace(IncidentKind::Received, "Client RX: ", text);
    ArrivalSplitter splitter;
    splitter.feed(text);
    splitter.finish();
    if (splitter.overlong()) {
        trace(IncidentKind::Dropped, "a piece longer than " +
                                         std::to_string(ArrivalSplitter::PieceLimit) +
                                         " bytes with no \"%>\": only its start is judged");
    }
    std::string piece;
    while (!unloaded_ && !proc.left() && splitter.next(piece)) handlePiece(proc, piece);
}

void FrmNUVTCPIP::handlePiece(Procedure& proc, const std::string& piece) {
    MessageFrame::Piece frame;
    proc.run([&] { frame = MessageFrame::Judge(piece); });
    switch (frame.verdict) {
        case MessageFrame::Verdict::Empty:
            return;
        case MessageFrame::Verdict::TooShort:
        case MessageFrame::Verdict::BadCrc:
            proc.run([&] { SendData("NAK", " "); });
            return;
        case MessageFrame::Verdict::Good:
            break;
    }
    if (frame.type == "ACK") {
        acknowledged(proc, frame.payload);
    } else if (frame.type == "NAK") {
        negativeAcknowledged(proc);
    } else {
        // Acknowledged before it is handled: a frame the driver cannot use is not resent.
        // Duplicates are not detected; a frame received twice is delivered twice.
        proc.run([&] { SendData("ACK", Format(Variant(frame.number), "000")); });
        if (unloaded_) return;
        proc.run([&] {
            DataArrival.raise(frame.type, frame.payload, Winsock.RemoteHostIP(),
                              Winsock.RemoteHost());
        });
    }
}

void FrmNUVTCPIP::acknowledged(Procedure& proc, const std::string& payload) {
    std::string number;
    proc.run([&] { number = Mid(payload, 3, 3); });
    for (const auto& entry : TXQueue.Items()) {
        proc.run([&] {
            if (Format(Variant(entry->MSGNum), "000") != number) return;
            if (TXQueue.Contains(entry.get())) TXQueue.Remove("KEY" + number);
        });
    }
}

void FrmNUVTCPIP::negativeAcknowledged(Procedure& proc) {
    // A NAK names no frame: the oldest queued one is resent, and ones NAKed into their third
    // try are dropped on the way.
    for (const auto& entry : TXQueue.Items()) {
        bool resent = false;
        proc.run([&] {
            if (!TXQueue.Contains(entry.get())) return;
            entry->NakCount = entry->NakCount + 1;
            if (entry->NakCount < 3) {
                entry->AckDelayCount = 0;
                if (connected()) {
                    trace(IncidentKind::Retried, "Client ReSend Nak Recived: ", entry->Message);
                    Winsock.SendData(entry->Message);
                }
                resent = true;
            } else {
                trace(IncidentKind::Dropped,
                      "frame given up after " + std::to_string(entry->NakCount) + " NAKs: ",
                      entry->Message);
                TXQueue.Remove(keyOf(entry->MSGNum));
            }
        });
        if (resent || proc.left()) return;
    }
}

void FrmNUVTCPIP::TmrAckDelay_Timer() {
    Procedure proc(kModule, "TmrAckDelay_Timer");
    proc.run([&] {
        if (TXQueue.Count() == 0) TmrAckDelay.Enabled(false);
    });
    for (const auto& entry : TXQueue.Items()) {
        proc.run([&] {
            if (!TXQueue.Contains(entry.get())) return;
            entry->AckDelayCount = entry->AckDelayCount + 1;
            if (entry->AckDelayCount <= 2) return;
            entry->AckDelayCount = 0;
            entry->NakCount = entry->NakCount + 1;
            if (entry->NakCount > 3) {
                trace(IncidentKind::TimedOut, "Client giveup no reply: ", entry->Message);
                TXQueue.Remove(keyOf(entry->MSGNum));
            } else if (connected()) {
                trace(IncidentKind::Retried, "Client ReSend no reply: ", entry->Message);
                Winsock.SendData(entry->Message);
            } else {
                // Not for want of a reply: there is no connection to resend it on.
                trace(IncidentKind::Dropped, "frame dropped, not connected to " + endpoint() + ": ",
                      entry->Message);
                TXQueue.Remove(keyOf(entry->MSGNum));
            }
        });
        if (proc.left()) return;
    }
}

void FrmNUVTCPIP::Winsock_Close() {
    // The queue stays; the timer drops its entries while the socket is down.
    Procedure proc(kModule, "Winsock_Close");
    trace(IncidentKind::Closed, "connection closed by the server at " + endpoint());
    proc.run([&] { WinSockClose.raise(); });
}

void FrmNUVTCPIP::Winsock_Error(int16_t Number, const std::string& Description) {
    Procedure proc(kModule, "Winsock_Error");
    // A reset or aborted connection was up; any other error is a connect that failed.
    const bool lost = Number == 10053 || Number == 10054;
    trace(lost ? IncidentKind::Closed : IncidentKind::OpenFailed,
          "Error: " + std::to_string(Number) + " " + Description + " (" + endpoint() + ")");
    proc.run([&] { WinSockError.raise(Number, Description); });
}

void FrmNUVTCPIP::TmrConnect_Timer() {
    Procedure proc(kModule, "TmrConnect_Timer");
    proc.run([&] { ConnectTimeout.raise(); });
}

void FrmNUVTCPIP::TmrConnect1_Timer() {
    Procedure proc(kModule, "TmrConnect1_Timer");
    proc.run([&] { ConnectTimeout1.raise(); });
}

void FrmNUVTCPIP::Form_Unload() {
    Procedure proc(kModule, "Form_Unload");
    unloaded_ = true;
    proc.run([&] { TXQueue.Clear(); });
    proc.run([&] { TXMessage.reset(); });
    proc.run([&] { Winsock.Close(); });
    TmrAckDelay.Enabled(false);
}

}  // namespace maroset
