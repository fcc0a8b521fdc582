#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "drivers/softplc/ClsTXMessage.h"
#include "drivers/softplc/MessageFrame.h"
#include "drivers/softplc/TXMessageQueue.h"
#include "lang/Event.h"
#include "lang/Subscription.h"
#include "lang/Variant.h"
#include "platform/LinkIncident.h"
#include "platform/Timer.h"
#include "platform/tcp/TcpClient.h"

namespace maroset {

class Procedure;

// The soft-PLC driver's connection: one TCP client socket (Winsock) and the acknowledgement
// timer (TmrAckDelay, 500 ms). It frames what the driver sends, keeps every data frame in
// TXQueue until the server acknowledges it, resends on silence or on a NAK, gives up after a
// fixed number of tries, and checks, acknowledges and passes on what the server sends.
//
// - Message numbers: MSGNum counts every frame built, ACK and NAK included, 001 first, 999 ->
//   000; a number is used up even when nothing can be sent.
// - Resends: every third tick without an ACK (1 to 1.5 s) a frame goes out again unchanged;
//   the fourth silent period drops it. A NAK (which names no frame) resends the oldest queued
//   frame; a frame NAKed or resent into its third try is dropped instead. The two limits
//   differ on purpose. Dropping is silent.
// - Received text is cut at every "%>" with no buffer between arrivals: a frame cut by the
//   transport is NAKed in pieces and the server's resend brings it whole.
// - SendData yields to the loop before it returns, so a data arrival, an ACK, a NAK or a tick
//   may run inside it and change the queue; a handler may even shut the driver down and
//   unload this object. Every visit of the queue works on a snapshot, and nothing of this
//   object is touched once it is unloaded.
//
// Errors trap as "FrmCommClient". Handlers the loop calls run as event procedures under the
// node's name. Made only through Create (the handlers hold weak references to it).
class FrmNUVTCPIP : public std::enable_shared_from_this<FrmNUVTCPIP> {
  public:
    // Loads the object for the node `nodeName` (the trace's source): the timer starts
    // enabled; the socket is idle until the driver connects it.
    static std::shared_ptr<FrmNUVTCPIP> Create(std::string nodeName);
    ~FrmNUVTCPIP();
    FrmNUVTCPIP(const FrmNUVTCPIP&) = delete;
    FrmNUVTCPIP& operator=(const FrmNUVTCPIP&) = delete;

    // Frames, queues (unless ACK or NAK) and sends one message, then yields to the loop.
    void SendData(const std::string& MsgType, const Variant& data);
    // A client error that reports nothing ("No Server Connection Available"); traced only.
    void WinError(const std::string& ErrMsg);
    // Raise ConnectTimeout and ConnectTimeout1; no timer drives them.
    void TmrConnect_Timer();
    void TmrConnect1_Timer();
    // Drops the queue and closes the socket; nothing is raised afterwards.
    void Form_Unload();

    // Socket and timer handlers, run by the loop (public so tests can drive them).
    void Winsock_Connect();
    void Winsock_DataArrival(int32_t bytesTotal);
    void Winsock_Close();
    void Winsock_Error(int16_t Number, const std::string& Description);
    void TmrAckDelay_Timer();

    bool unloaded() const { return unloaded_; }

    // "host:port" of the server.
    std::string endpoint() const;
    // Tells an incident of this link under the node's name: the words, then the frame shown
    // readably.
    void trace(platform::IncidentKind kind, std::string_view words,
               std::string_view frame = {}) const;
    const std::string& nodeName() const { return nodeName_; }

    int32_t MSGNum = 0;
    TXMessageQueue TXQueue;
    std::shared_ptr<ClsTXMessage> TXMessage;
    platform::TcpClient Winsock;
    platform::Timer TmrAckDelay;

    Event<> WinSockClose;
    // MessageID (the type), Message (";~" + data + ";~"), RemoteIP, RemoteHost.
    Event<const std::string&, const std::string&, const std::string&, const std::string&>
        DataArrival;
    Event<int16_t, const std::string&> WinSockError;
    Event<> ConnectTimeout;
    Event<> ConnectTimeout1;

    static constexpr int32_t AckDelayInterval = 500;

  private:
    explicit FrmNUVTCPIP(std::string nodeName);
    void hook();
    void handlePiece(Procedure& proc, const std::string& piece);
    void acknowledged(Procedure& proc, const std::string& payload);
    void negativeAcknowledged(Procedure& proc);
    bool connected() const;

    std::string nodeName_;
    bool unloaded_ = false;
    std::vector<Subscription> subscriptions_;
};

}  // namespace maroset
