#include "drivers/df1/FrmNUVProSerial.h"

#include <gtest/gtest.h>

#include <memory>
#include <utility>

#include "Df1Line.h"
#include "support/ErrorOf.h"

namespace maroset::test {
namespace {

// The port owner on an in-memory line, set up as the driver sets it up, polling N7:0.
class Df1Link : public Df1LineFixture {
  protected:
    Df1Link() {
        owner->CommPort(1);
        owner->CommSettings("19200,n,8,1");
        owner->CommTimeOut(1000);
        owner->PLCNode(1);
        owner->PLCWordCount(2);
        owner->PLCAddress(Variant("N7:0"));
        owner->PLCFunction(Variant(int16_t{1}));
        complete = owner->Complete.subscribe(
            [this](const std::string& text, uint8_t level) { texts.emplace_back(text, level); });
        reads = owner->ReadComplete.subscribe([this](VbArray<Variant>& v) { values.push_back(v); });
    }
    // The request for N7:0, two words, with transaction number tns.
    static std::string ReadRequest(int tns) {
        return Df1Frame(Bytes({1, 0, 0x0F, 0, tns & 0xFF, tns >> 8, 0xA2, 4, 7, 0x89, 0, 0}));
    }
    std::vector<std::string> textsOnly() const {
        std::vector<std::string> out;
        for (const auto& t : texts) out.push_back(t.first);
        return out;
    }

    std::unique_ptr<FrmNUVProSerial> owner = std::make_unique<FrmNUVProSerial>("PLC");
    std::vector<std::pair<std::string, uint8_t>> texts;
    std::vector<VbArray<Variant>> values;
    Subscription complete, reads;
};

const std::string kAck = Bytes({0x10, 0x06}), kNak = Bytes({0x10, 0x15}),
                  kEnq = Bytes({0x10, 0x05});

TEST_F(Df1Link, ReadRequestIsFramedWithDoubledDlesAndTheCrcOverTheUnstuffedBody) {
    owner->RefreshData();
    EXPECT_EQ(hostSent(), ReadRequest(1));
    EXPECT_TRUE(owner->Busy());
    EXPECT_TRUE(owner->AwaitingReply());

    // DST 16 goes out as 16 16 and counts once in the CRC.
    plcSends(kAck);
    owner->PLCNode(16);
    owner->RefreshData();
    const std::string sent = hostSent();
    EXPECT_EQ(sent, Df1Frame(Bytes({16, 0, 0x0F, 0, 2, 0, 0xA2, 4, 7, 0x89, 0, 0})));
    EXPECT_EQ(sent.substr(0, 4), Bytes({0x10, 0x02, 0x10, 0x10}));
}

TEST_F(Df1Link, TransactionNumbersRunTo16000ThenWrapToZero) {
    owner->TransactionNumber(15999);
    for (const int tns : {16000, 0, 1}) {
        owner->RefreshData();
        EXPECT_EQ(hostSent(), ReadRequest(tns));
        plcSends(kAck);
    }
}

TEST_F(Df1Link, WritesSendLowThenHighAndMoreWordsOverlapByOneByte) {
    owner->PLCAddress(Variant("N7:4"));
    owner->PLCWordCount(1);
    owner->PLCFunction(Variant(int16_t{2}));
    owner->DataInt(0, 0x1234);
    owner->RefreshData();
    EXPECT_EQ(hostSent(),
              Df1Frame(Bytes({1, 0, 0x0F, 0, 1, 0, 0xAA, 2, 7, 0x89, 4, 0, 0x34, 0x12})));
    plcSends(kAck);

    // Each high byte but the last is overwritten by the next low byte; the tail stays 0.
    owner->PLCWordCount(3);
    owner->DataInt(0, 0x1111);
    owner->DataInt(1, 0x2222);
    owner->DataInt(2, 0x3333);
    owner->RefreshData();
    EXPECT_EQ(hostSent(), Df1Frame(Bytes({1, 0, 0x0F, 0, 2, 0, 0xAA, 6, 7, 0x89, 4, 0, 0x11, 0x22,
                                          0x33, 0x33, 0, 0})));
    plcSends(kAck);

    // Any other function resends the buffer as it was built last.
    owner->PLCFunction(Variant(int16_t{3}));
    owner->RefreshData();
    EXPECT_EQ(hostSent(), Df1Frame(Bytes({1, 0, 0x0F, 0, 2, 0, 0xAA, 6, 7, 0x89, 4, 0, 0x11, 0x22,
                                          0x33, 0x33, 0, 0})));
}

TEST_F(Df1Link, NakIsAnsweredWithThreeResendsThenAbortAndTheCountOutlivesASuccess) {
    owner->RefreshData();
    const std::string frame = hostSent();
    for (int i = 0; i < 3; ++i) {
        plcSends(kNak);
        EXPECT_EQ(hostSent(), frame) << "resend " << i + 1;
    }
    plcSends(kNak);
    EXPECT_EQ(hostSent(), "");
    EXPECT_FALSE(owner->Busy());
    EXPECT_FALSE(owner->AwaitingReply());
    EXPECT_EQ(textsOnly(),
              (std::vector<std::string>{
                  "Receivied NAK - Resending Message", "Receivied NAK - Resending Message",
                  "Receivied NAK - Resending Message", "Receivied NAK - Aborting message"}));
    EXPECT_EQ(texts.back().second, 4);

    // Three NAKs, then ACK: a success does not reset the count, so the next NAK aborts.
    texts.clear();
    owner->RefreshData();
    for (int i = 0; i < 3; ++i) plcSends(kNak);
    plcSends(kAck);
    EXPECT_EQ(owner->NakRetries(), 3);
    owner->RefreshData();
    hostSent();
    plcSends(kNak);
    EXPECT_EQ(hostSent(), "");
    EXPECT_EQ(texts.back().first, "Receivied NAK - Aborting message");
}

TEST_F(Df1Link, SilenceGetsThreeEnquiriesOneTimeOutApartThenGivesUp) {
    owner->RefreshData();
    hostSent();
    for (int i = 0; i < 3; ++i) {
        advance(999ms);
        EXPECT_EQ(hostSent(), "") << "too early, inquiry " << i + 1;
        advance(1ms);
        EXPECT_EQ(hostSent(), kEnq) << "inquiry " << i + 1;
    }
    advance(1000ms);
    EXPECT_EQ(hostSent(), "");
    EXPECT_FALSE(owner->Busy());
    EXPECT_EQ(textsOnly(), (std::vector<std::string>{
                               "No Responce - Resending Message", "No Responce - Resending Message",
                               "No Responce - Resending Message", "No Responce - Timed out"}));
    advance(5000ms);
    EXPECT_EQ(hostSent(), "") << "the time-out stops once it gave up";

    // One time-out, then an ACK: the count carries over to the next request.
    owner->RefreshData();
    advance(1000ms);
    plcSends(kAck);
    EXPECT_EQ(owner->NoReplyRetries(), 1);
}

TEST_F(Df1Link, GoodReplyIsAckedAndDecodedBadOneIsNakedWithTheByteDump) {
    owner->RefreshData();
    hostSent();
    plcSends(kAck);
    // 0xFFFF is -1, 0x8000 is -32768; a data byte 0x10 travels doubled.
    plcSends(Df1Frame(ReadReply(1, {0x8000, 0x10FF})));
    EXPECT_EQ(hostSent(), kAck);
    ASSERT_EQ(values.size(), 1u);
    EXPECT_EQ(values[0].LBound(), 0);
    EXPECT_EQ(values[0].UBound(), 2);
    EXPECT_EQ(values[0](0), Variant(int16_t{-32768}));
    EXPECT_EQ(values[0](1), Variant(int16_t{0x10FF}));
    EXPECT_EQ(owner->DataInt(1), 0x10FF);
    EXPECT_FALSE(owner->Busy());
    EXPECT_EQ(owner->LastReply(), 6);

    owner->RefreshData();
    hostSent();
    plcSends(kAck);
    std::string bad = Df1Frame(ReadReply(2, {-1, 7}));
    bad.back() = static_cast<char>(bad.back() ^ 1);
    plcSends(bad);
    EXPECT_EQ(hostSent(), kNak);
    EXPECT_EQ(values.size(), 1u);
    EXPECT_TRUE(owner->Busy());
    const uint8_t crcLow = static_cast<uint8_t>(bad[bad.size() - 2]);
    const uint8_t crcHigh = static_cast<uint8_t>(bad.back());
    // Body, DLE, ETX, the two check bytes, and the cell after them.
    EXPECT_EQ(texts.back().first, "Received Bad CRC  0x1x79x0x2x0x255x255x7x0x16x3x" +
                                      std::to_string(crcLow) + "x" + std::to_string(crcHigh) +
                                      "x0x");
    EXPECT_EQ(texts.back().second, 3);
    plcSends(kEnq);
    EXPECT_EQ(hostSent(), kNak);
    EXPECT_EQ(texts.back().first, "Received ENQ Responce: 21");
}

TEST_F(Df1Link, RepliesThatAreNotReadRepliesAreAckedButNotDecoded) {
    // Before any reply the last reply counts as NAK.
    owner->RefreshData();
    plcSends(kEnq);
    hostSent();
    EXPECT_EQ(texts.back().first, "Received ENQ Responce: 21");
    std::string body = ReadReply(1, {5, 6});
    body[2] = 0x4E;
    plcSends(kAck + Df1Frame(body));
    EXPECT_EQ(hostSent(), kAck);
    EXPECT_TRUE(values.empty()) << "not CMD 0x4F";

    owner->PLCFunction(Variant(int16_t{2}));
    plcSends(Df1Frame(ReadReply(1, {5, 6})));
    EXPECT_TRUE(values.empty()) << "the last request was not a read";
    plcSends(kEnq);
    EXPECT_EQ(hostSent(), kAck + kAck);
    EXPECT_EQ(texts.back().first, "Received ENQ Responce: 6");
}

TEST_F(Df1Link, AGapOver15MsDropsTheFrameSilently) {
    owner->RefreshData();
    plcSends(kAck);
    hostSent();
    const std::string frame = Df1Frame(ReadReply(1, {1, 2}));
    plcSends(frame.substr(0, 6));
    advance(14ms);
    plcSends(frame.substr(6, 6));
    advance(14ms);
    plcSends(frame.substr(12));
    EXPECT_EQ(values.size(), 1u) << "gaps of 14 ms keep the frame";

    plcSends(frame.substr(0, 6));
    advance(16ms);
    EXPECT_FALSE(owner->receiver().InMessage);
    plcSends(frame.substr(6));
    EXPECT_EQ(values.size(), 1u);
    EXPECT_EQ(hostSent(), kAck) << "only the first frame was answered";
    EXPECT_EQ(texts.size(), 0u);
}

TEST_F(Df1Link, WatchdogClearsBusyAfterFiveSecondsWithoutAByte) {
    owner->RefreshData();
    advance(2500ms);
    plcSends(kAck);  // restarts the count
    advance(4999ms);
    EXPECT_TRUE(owner->Busy());
    advance(1ms);
    EXPECT_FALSE(owner->Busy());
    ASSERT_FALSE(texts.empty());
    EXPECT_EQ(texts.back(), std::make_pair(std::string("WatchDog Timeout"), uint8_t{4}));
}

TEST_F(Df1Link, APollDuringAnExchangeOnlyClearsTheFlag) {
    owner->RefreshData();
    hostSent();
    owner->RefreshData();
    EXPECT_EQ(texts.back(), std::make_pair(std::string("Missed poll Tx"), uint8_t{3}));
    EXPECT_FALSE(owner->AwaitingReply());
    EXPECT_EQ(hostSent(), "");

    plcSends(Df1Frame(ReadReply(1, {1, 2})).substr(0, 5));
    owner->RefreshData();
    EXPECT_EQ(texts.back().first, "Missed poll Rx");
    EXPECT_FALSE(owner->receiver().InMessage);
    EXPECT_EQ(hostSent(), "");
    owner->RefreshData();
    EXPECT_EQ(hostSent(), ReadRequest(2));
}

TEST_F(Df1Link, AMissingDeviceFailsNamingItAndTheNextRequestReachesItOncePlugged) {
    runtime().serialDevices().unplug("/dev/ttyS0");
    runtime().mapSerialPort(1, "/nonexistent/ttyDF1", "PLC");
    try {
        owner->RefreshData();
        FAIL() << "opened a missing device";
    } catch (const VbError& e) {
        EXPECT_EQ(e.number(), 8002);
        EXPECT_NE(e.description().find("/nonexistent/ttyDF1"), std::string::npos);
    }
    runtime().serialDevices().plug("/nonexistent/ttyDF1", cable.hostEnd());
    owner->RefreshData();
    EXPECT_EQ(hostSent(), ReadRequest(1)) << "nothing was numbered for the failed attempt";
}

TEST_F(Df1Link, AHandlerMayDestroyTheOwnerWhileAReplyIsBeingHandled) {
    reads = owner->ReadComplete.subscribe([this](VbArray<Variant>&) { owner.reset(); });
    owner->RefreshData();
    // More bytes follow in the same delivery: nothing may step the destroyed receiver.
    plcSends(kAck + Df1Frame(ReadReply(1, {1, 2})) + kEnq);
    EXPECT_EQ(owner, nullptr);
}

}  // namespace
}  // namespace maroset::test
