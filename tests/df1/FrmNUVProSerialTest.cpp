#include "drivers/df1/FrmNUVProSerial.h"

#include <gtest/gtest.h>

#include <memory>
#include <utility>

#include "Df1Line.h"

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

    // A good reply after a write request is ACKed but not decoded.
    owner->PLCFunction(Variant(int16_t{2}));
    plcSends(Df1Frame(ReadReply(2, {5, 6})));
    EXPECT_EQ(values.size(), 1u);
    plcSends(kEnq);
    EXPECT_EQ(hostSent(), kAck + kAck);
    EXPECT_EQ(texts.back().first, "Received ENQ Responce: 6");
}

TEST_F(Df1Link, TheReceiverStepsThroughTrailersControlSequencesAndFloodsAsIntended) {
    owner->RefreshData();  // opens the port
    hostSent();
    // Two check bytes are awaited after DLE ETX, whatever they are.
    plcSends(Bytes({0x10, 0x02, 9, 0x10, 0x03, 0xAA}));
    EXPECT_TRUE(owner->receiver().InMessage);
    plcSends(Bytes({0xBB}));
    EXPECT_EQ(hostSent(), kNak);
    EXPECT_EQ(texts.back().first, "Received Bad CRC  9x16x3x170x187x0x");

    // DLE ACK inside a frame drops those two bytes; three are left, so they are checked.
    plcSends(Bytes({0x10, 0x02, 1, 2, 3, 0x10, 0x06}));
    EXPECT_EQ(texts.back().first, "Received Bad CRC  1x2x3x16x");
    // One left after DLE ENQ: no check, and the ENQ is answered with the last reply.
    texts.clear();
    plcSends(Bytes({0x10, 0x02, 1, 0x10, 0x05}));
    EXPECT_EQ(textsOnly(), std::vector<std::string>{"Received ENQ Responce: 21"});
    hostSent();

    // After a doubled DLE the previous byte counts as 0: DLE DLE ACK is data, not a reply.
    // Bytes beyond the buffer (0..19 here) keep overwriting its last cell.
    std::string flood = Bytes({0x10, 0x02, 0x10, 0x10, 0x06});
    for (int i = 0; i < 40; ++i) flood += static_cast<char>(0x20 + i);
    plcSends(flood);
    EXPECT_EQ(owner->receiver().RxCount, 19);
    EXPECT_EQ(owner->receiver().RxBuffer(1), 0x06);
    EXPECT_EQ(owner->receiver().RxBuffer(19), 0x20 + 39);
    EXPECT_EQ(hostSent(), "");
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

}  // namespace
}  // namespace maroset::test
