#include "drivers/softplc/FrmNUVTCPIP.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "sim/softplc/ServerFrames.h"
#include "support/ErrorOf.h"
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using sim::ServerFrame;
using std::chrono::milliseconds;

// The client against a server played by the test, in memory at plc:5000. Every frame the
// expectations name is written by the server side's own writer.
class SoftPlcClient : public test::RuntimeFixture {
  protected:
    SoftPlcClient() {
        runtime().tcp().setRealSockets(false);
        runtime().tcp().plug("plc", 5000,
                             [this](const std::shared_ptr<platform::MemoryTcpLink>& l) {
                                 link = l;
                                 l->serverEnd()->listen({{}, {}, [](std::string_view) {}, {}, {}});
                             });
        form = FrmNUVTCPIP::Create("PLC1");
        arrivals =
            form->DataArrival.subscribe([this](const std::string& type, const std::string& payload,
                                               const std::string& ip, const std::string& host) {
                delivered.push_back(type + " " + payload + " " + ip + " " + host);
                if (onArrival) onArrival();
            });
        closes = form->WinSockClose.subscribe([this] { ++closed; });
        errors = form->WinSockError.subscribe([this](int16_t n, const std::string& d) {
            socketErrors.push_back(std::to_string(n) + " " + d);
        });
        form->Winsock.RemoteHost("plc");
        form->Winsock.RemotePort(5000);
        form->Winsock.Connect();
        advance(milliseconds(0));
    }

    // Lets the first tick of the acknowledgement timer pass: it finds the queue empty and
    // stops the timer, so the next send starts its count afresh.
    void settle() {
        advance(milliseconds(500));
        wire();
        trace.clear();
    }
    void fromServer(const std::string& bytes) {
        link->serverEnd()->write(bytes);
        advance(milliseconds(0));
    }
    // What the client wrote since the last look.
    std::string wire() { return link ? link->takeClientSent() : std::string(); }
    static std::string frame(const char* type, int32_t number, const std::string& data) {
        return ServerFrame::Write(type, number, data);
    }

    std::shared_ptr<platform::MemoryTcpLink> link;
    std::shared_ptr<FrmNUVTCPIP> form;
    std::vector<std::string> delivered;
    test::IncidentRecorder incidents_;
    std::vector<std::string>& trace = incidents_.lines;
    std::vector<std::string> socketErrors;
    int closed = 0;
    std::function<void()> onArrival;
    Subscription arrivals, closes, errors;
};

TEST_F(SoftPlcClient, NumbersEveryFrameFromOneAckAndNakIncludedAndWrapsAfter999) {
    ASSERT_EQ(form->Winsock.State(), platform::TcpClient::sckConnected);
    form->SendData("TSL", Variant("1000;~0"));
    EXPECT_EQ(wire(), frame("TSL", 1, "1000;~0"));
    fromServer(frame("ACK", 39, "001") + frame("NTV", 40, "1;~5;~42"));
    EXPECT_EQ(wire(), frame("ACK", 2, "040"));
    fromServer("junk that is long enough%>");
    EXPECT_EQ(wire(), frame("NAK", 3, " "));

    form->MSGNum = 998;
    form->SendData("NTV", Variant("1;~5;~1"));
    form->SendData("NTV", Variant("1;~5;~2"));
    form->SendData("NTV", Variant("1;~5;~3"));
    EXPECT_EQ(wire(), frame("NTV", 999, "1;~5;~1") + frame("NTV", 0, "1;~5;~2") +
                          frame("NTV", 1, "1;~5;~3"));
    // Numbers 999, 000 and 001 wait for their ACKs under their own keys.
    EXPECT_TRUE(form->TXQueue.ContainsKey("KEY999"));
    EXPECT_TRUE(form->TXQueue.ContainsKey("KEY000"));

    // With no connection nothing goes out, nothing is queued, and the number is used up.
    form->Winsock.Close();
    const int32_t queued = form->TXQueue.Count();
    form->SendData("RSL", Variant(" "));
    EXPECT_EQ(form->MSGNum, 2);
    EXPECT_EQ(form->TXQueue.Count(), queued);
    EXPECT_EQ(trace.back(),
              "PLC1: No Server Connection Available: not connected to plc:5000, lost RSL frame "
              "002:  ")
        << "the line names the address and the frame lost";
}

TEST_F(SoftPlcClient, ANumberStillWaitingWhenItComesRoundAgainFailsTheSendWith457) {
    form->SendData("TSL", Variant(" "));
    wire();
    form->MSGNum = 0;
    EXPECT_EQ(test::errorOf([&] { form->SendData("TSL", Variant("again")); }), 457);
    EXPECT_EQ(wire(), "") << "the frame that could not be queued is not sent";
}

TEST_F(SoftPlcClient, ResendsAnUnansweredFrameAfterAbout1point5And3And4point5SecondsThenDropsIt) {
    settle();
    const std::string sent = frame("NTV", 1, "1;~5;~42");
    form->SendData("NTV", Variant("1;~5;~42"));
    EXPECT_EQ(wire(), sent);
    for (int resend = 1; resend <= 3; ++resend) {
        advance(milliseconds(1499));
        EXPECT_EQ(wire(), "") << "resend " << resend << " too early";
        advance(milliseconds(1));
        EXPECT_EQ(wire(), sent) << "resend " << resend;
    }
    advance(milliseconds(1500));
    EXPECT_EQ(wire(), "");
    EXPECT_EQ(form->TXQueue.Count(), 0);
    EXPECT_EQ(trace,
              (std::vector<std::string>{
                  "PLC1: Client Send: " + sent, "PLC1: Client ReSend no reply: " + sent,
                  "PLC1: Client ReSend no reply: " + sent, "PLC1: Client ReSend no reply: " + sent,
                  "PLC1: Client giveup no reply: " + sent}));
    advance(milliseconds(10000));
    EXPECT_FALSE(form->TmrAckDelay.Enabled());
    EXPECT_EQ(wire(), "");
}

TEST_F(SoftPlcClient, AnAckStopsTheResendsAndAnAckForAnUnknownNumberChangesNothing) {
    settle();
    form->SendData("TSL", Variant("1000;~0"));
    form->SendData("NTV", Variant("1;~5;~1"));
    wire();
    fromServer(frame("ACK", 7, "009"));  // nothing sent under 009
    EXPECT_EQ(form->TXQueue.Count(), 2);
    fromServer(frame("ACK", 8, "001"));
    EXPECT_EQ(form->TXQueue.Count(), 1);
    EXPECT_EQ(wire(), "") << "ACKs are never acknowledged";
    advance(milliseconds(1500));
    EXPECT_EQ(wire(), frame("NTV", 2, "1;~5;~1"));
}

TEST_F(SoftPlcClient, ANakResendsTheOldestFrameAndDropsItAtItsThirdNak) {
    settle();
    const std::string first = frame("TSL", 1, "a");
    const std::string second = frame("TSL", 2, "b");
    form->SendData("TSL", Variant("a"));
    form->SendData("TSL", Variant("b"));
    wire();
    fromServer(frame("NAK", 1, " "));
    EXPECT_EQ(wire(), first);
    fromServer(frame("NAK", 2, " "));
    EXPECT_EQ(wire(), first);
    fromServer(frame("NAK", 3, " "));
    EXPECT_EQ(wire(), second) << "the first is dropped at its third NAK, the next one resent";
    EXPECT_EQ(form->TXQueue.Count(), 1);
    EXPECT_EQ(trace.back(), "PLC1: Client ReSend Nak Recived: " + second);
    // A NAK restarts the silence count of the frame it resent.
    advance(milliseconds(1000));
    EXPECT_EQ(wire(), "");
}

TEST_F(SoftPlcClient, SilenceAndNakResendsShareOneCount) {
    settle();
    const std::string sent = frame("TSL", 1, "a");
    form->SendData("TSL", Variant("a"));
    advance(milliseconds(1500));  // resent on silence: one try used
    EXPECT_EQ(wire(), sent + sent);
    fromServer(frame("NAK", 1, " "));
    EXPECT_EQ(wire(), sent);
    fromServer(frame("NAK", 2, " "));
    EXPECT_EQ(wire(), "");
    EXPECT_EQ(form->TXQueue.Count(), 0);
}

TEST_F(SoftPlcClient, ANakWithNothingQueuedDoesNothing) {
    fromServer(frame("NAK", 1, " "));
    EXPECT_EQ(wire(), "");
    EXPECT_EQ(form->MSGNum, 0);
}

TEST_F(SoftPlcClient, AcknowledgesAndDeliversEveryGoodFrameOfAnArrivalInOrder) {
    form->SendData("TSL", Variant("x"));
    wire();
    fromServer(frame("NTV", 11, "1;~5;~a") + frame("ACK", 12, "001") + frame("MSG", 13, "hi"));
    EXPECT_EQ(wire(), frame("ACK", 2, "011") + frame("ACK", 3, "013"));
    EXPECT_EQ(delivered, (std::vector<std::string>{"NTV ;~1;~5;~a;~ 127.0.0.1 plc",
                                                   "MSG ;~hi;~ 127.0.0.1 plc"}));
    EXPECT_EQ(form->TXQueue.Count(), 0);
    // Duplicates are not detected: the same frame again is acknowledged and delivered again.
    fromServer(frame("NTV", 11, "1;~5;~a"));
    EXPECT_EQ(wire(), frame("ACK", 4, "011"));
    EXPECT_EQ(delivered.size(), 3u);
}

TEST_F(SoftPlcClient, AFrameCutInTwoIsNakedTwiceAndArrivesWithTheServersResend) {
    const std::string whole = frame("NTV", 21, "1;~5;~12345");
    fromServer(whole.substr(0, 14));
    fromServer(whole.substr(14));
    EXPECT_EQ(wire(), frame("NAK", 1, " ") + frame("NAK", 2, " "));
    EXPECT_TRUE(delivered.empty());
    fromServer(whole);
    EXPECT_EQ(wire(), frame("ACK", 3, "021"));
    EXPECT_EQ(delivered.size(), 1u);
}

TEST_F(SoftPlcClient, ShortPiecesBadChecksAndDelimitersInsideDataAreEachNaked) {
    fromServer("<%x%>%>");  // "<%x" is too short; the empty piece between is skipped
    EXPECT_EQ(wire(), frame("NAK", 1, " "));
    fromServer("<%NTV001;~1;~5;~9;~00x000%>");  // a CRC that is not digits
    EXPECT_EQ(wire(), frame("NAK", 2, " "));
    fromServer(frame("NTV", 3, "1;~5;~a%>b"));  // the receiver splits inside the data
    EXPECT_EQ(wire(), frame("NAK", 3, " ") + frame("NAK", 4, " "));
    EXPECT_TRUE(delivered.empty());
    EXPECT_EQ(trace.front(), "PLC1: connected99: connected to plc:5000");
    EXPECT_EQ(trace[1], "PLC1: Client RX: <%x%>%>");
}

TEST_F(SoftPlcClient, AClosedConnectionIsReportedAndItsQueueDiesOnTheTimer) {
    settle();
    form->SendData("TSL", Variant("a"));
    wire();
    link->serverEnd()->close();
    advance(milliseconds(0));
    EXPECT_EQ(closed, 1);
    EXPECT_EQ(form->Winsock.State(), platform::TcpClient::sckClosing);
    EXPECT_EQ(form->TXQueue.Count(), 1) << "the queue is kept";
    advance(milliseconds(1500));
    EXPECT_EQ(form->TXQueue.Count(), 0) << "dropped at its first silent period, not resent";
}

TEST_F(SoftPlcClient, ARefusedConnectIsRaisedWithTheSocketsNumberAndText) {
    runtime().tcp().unplug("plc", 5000);
    form->Winsock.Close();
    form->Winsock.Connect();
    EXPECT_EQ(form->Winsock.State(), platform::TcpClient::sckConnecting);
    advance(milliseconds(0));
    EXPECT_EQ(form->Winsock.State(), platform::TcpClient::sckError);
    EXPECT_EQ(socketErrors, std::vector<std::string>{"10061 Connection is forcefully rejected"});
    EXPECT_EQ(trace.back(), "PLC1: Error: 10061 Connection is forcefully rejected (plc:5000)");
    EXPECT_EQ(incidents_.entries.back().kind, platform::IncidentKind::OpenFailed);
    EXPECT_EQ(incidents_.entries.back().endpoint, "plc:5000");
    EXPECT_EQ(test::errorOf([&] { form->Winsock.Connect(); }), 40020) << "closed first";
}

TEST_F(SoftPlcClient, AnAckArrivingWhileSendDataYieldsIsHandledBeforeItReturns) {
    settle();
    link->serverEnd()->write(frame("ACK", 1, "001"));  // waits for the loop
    form->SendData("TSL", Variant("a"));
    EXPECT_EQ(form->TXQueue.Count(), 0);
}

TEST_F(SoftPlcClient, AHandlerThatSendsWhileMoreDataWaitsKeepsTheArrivalsInOrder) {
    int depth = 0, deepest = 0;
    onArrival = [&] {
        ++depth;
        deepest = std::max(deepest, depth);
        form->SendData("NTV", Variant("1;~5;~w"));  // yields to the loop
        --depth;
    };
    link->serverEnd()->write(frame("NTV", 1, "1;~5;~a"));
    link->serverEnd()->write(frame("NTV", 2, "1;~5;~b"));
    advance(milliseconds(0));
    EXPECT_EQ(deepest, 1) << "an arrival never runs inside the previous one's handler";
    ASSERT_EQ(delivered.size(), 2u);
    EXPECT_EQ(delivered[0].substr(0, 13), "NTV ;~1;~5;~a");
    EXPECT_EQ(delivered[1].substr(0, 13), "NTV ;~1;~5;~b");
}

TEST_F(SoftPlcClient, AHandlerThatUnloadsAndReleasesTheClientEndsTheArrivalThere) {
    onArrival = [&] {
        form->Form_Unload();
        form.reset();
    };
    fromServer(frame("NTV", 1, "1;~5;~a") + frame("NTV", 2, "1;~5;~b"));
    EXPECT_EQ(delivered.size(), 1u);
    EXPECT_EQ(wire(), frame("ACK", 1, "001"));
    advance(milliseconds(5000));  // the timer and the socket are gone with it
}

// What the trace tells a person about the connection, each line checked by its words.
using SoftPlcClientTrace = SoftPlcClient;

TEST_F(SoftPlcClientTrace, AFrameGivenUpAfterNaksIsTold) {
    settle();
    const std::string first = frame("TSL", 1, "a");
    form->SendData("TSL", Variant("a"));
    form->SendData("TSL", Variant("b"));
    for (int n = 1; n <= 3; ++n) fromServer(frame("NAK", n, " "));
    EXPECT_TRUE(incidents_.has("PLC1: frame given up after 3 NAKs: " + first));
    EXPECT_EQ(incidents_.find("given up")->kind, platform::IncidentKind::Dropped);
}

TEST_F(SoftPlcClientTrace, APeerThatClosesIsToldAndItsQueueIsDroppedNotGivenUpForSilence) {
    settle();
    const std::string sent = frame("TSL", 1, "a");
    form->SendData("TSL", Variant("a"));
    link->serverEnd()->close();
    advance(milliseconds(0));
    EXPECT_EQ(trace.back(), "PLC1: connection closed by the server at plc:5000");
    EXPECT_EQ(incidents_.entries.back().kind, platform::IncidentKind::Closed);
    advance(milliseconds(1500));
    EXPECT_EQ(trace.back(), "PLC1: frame dropped, not connected to plc:5000: " + sent);
    EXPECT_FALSE(incidents_.has("Client giveup no reply")) << "it was not for want of a reply";
}

TEST_F(SoftPlcClientTrace, AFrameTheServerNeverAnswersIsGivenUpAsTimedOut) {
    settle();
    form->SendData("TSL", Variant("a"));
    advance(milliseconds(7000));
    const auto* giveup = incidents_.find("Client giveup no reply: ");
    ASSERT_NE(giveup, nullptr);
    EXPECT_EQ(giveup->kind, platform::IncidentKind::TimedOut);
    EXPECT_EQ(giveup->endpoint, "plc:5000");
}

}  // namespace
}  // namespace maroset
