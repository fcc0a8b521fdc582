#include "drivers/df1/Df1Receiver.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Df1Line.h"
#include "core/Procedure.h"

namespace maroset::test {
namespace {

// The receiver alone, with a link that writes down what each byte asked of it.
class Df1ReceiverSteps : public RuntimeFixture, protected Df1Receiver::Link {
  protected:
    void feed(const std::string& bytes) {
        Procedure proc("FrmNUVProSerial", "MSComm1_OnComm");
        for (const char c : bytes) rx.feed(static_cast<uint8_t>(c), *this, proc);
    }
    // The stored bytes 0..RxCount-1 of the frame seen at each frameReceived.
    std::string storedFrame() const {
        std::string out;
        for (int i = 0; i < rx.RxCount; ++i) out += static_cast<char>(rx.RxBuffer(i));
        return out;
    }

    void restartEndOfMessage() override { ++restarts; }
    void stopEndOfMessage() override { log += "stop;"; }
    bool frameReceived() override {
        frames.push_back(storedFrame());
        log += "frame;";
        return true;
    }
    bool controlReceived(uint8_t code) override {
        log += "control " + std::to_string(code) + ";";
        return true;
    }

    Df1Receiver rx{19};
    int restarts = 0;
    std::vector<std::string> frames;
    std::string log;
};

TEST_F(Df1ReceiverSteps, StoresTheFrameOnceWithItsTrailerAndUndoubledDles) {
    const std::string body = Bytes({0, 1, 0x4F, 0, 0x10, 0x10, 0x10, 7});
    feed(Bytes({0x42}) + Df1Frame(body));  // a stray byte before the frame is ignored
    ASSERT_EQ(frames.size(), 1u);
    const std::string wire = Df1Frame(body);
    // Body (DLE pairs stored once), then DLE ETX and the two check bytes.
    EXPECT_EQ(frames[0], body + wire.substr(wire.size() - 4));
    EXPECT_EQ(log, "frame;stop;");
    EXPECT_EQ(restarts, int(wire.size()) - 2) << "every byte after DLE STX restarts the gap";
    EXPECT_FALSE(rx.InMessage);

    // After a doubled DLE the previous byte counts as 0: DLE DLE ACK is data, not a reply.
    log.clear();
    feed(Bytes({0x10, 0x02, 1, 0x10, 0x10, 0x06, 2}));
    EXPECT_EQ(log, "");
    EXPECT_EQ(storedFrame(), Bytes({1, 0x10, 0x06, 2}));
}

TEST_F(Df1ReceiverSteps, TwoCheckBytesAreAlwaysAwaitedAfterDleEtx) {
    feed(Bytes({0x10, 0x02, 9, 0x10, 0x03, 0xAA}));
    EXPECT_TRUE(frames.empty());
    EXPECT_TRUE(rx.InMessage);
    feed(Bytes({0xBB}));
    ASSERT_EQ(frames.size(), 1u);
    EXPECT_EQ(frames[0], Bytes({9, 0x10, 0x03, 0xAA, 0xBB}));
}

TEST_F(Df1ReceiverSteps, AControlSequenceInsideAFrameEndsItAndIsActedOn) {
    // Three bytes left after dropping DLE ACK: checked as a frame, then the ACK is handled.
    feed(Bytes({0x10, 0x02, 1, 2, 3, 0x10, 0x06}));
    EXPECT_EQ(frames, std::vector<std::string>{Bytes({1, 2, 3})});
    EXPECT_EQ(log, "frame;stop;control 6;");
    // Two or fewer left: dropped without a check.
    log.clear();
    feed(Bytes({0x10, 0x02, 1, 0x10, 0x05}));
    EXPECT_EQ(log, "stop;control 5;");
    EXPECT_EQ(rx.RxCount, 1);
    // DLE STX inside a frame starts a new one.
    log.clear();
    feed(Bytes({0x10, 0x02, 1, 2, 3, 4, 0x10, 0x02, 5}));
    EXPECT_EQ(log, "frame;stop;");
    EXPECT_TRUE(rx.InMessage);
    EXPECT_EQ(storedFrame(), Bytes({5}));
}

TEST_F(Df1ReceiverSteps, BytesBeyondTheBufferKeepOverwritingTheLastCell) {
    std::string flood = Bytes({0x10, 0x02});
    for (int i = 0; i < 40; ++i) flood += static_cast<char>(0x20 + i);
    feed(flood);
    EXPECT_EQ(rx.RxCount, 19);
    EXPECT_EQ(rx.RxBuffer(18), 0x20 + 18);
    EXPECT_EQ(rx.RxBuffer(19), 0x20 + 39);

    // A buffer made smaller under a running frame fails cleanly, never past its end.
    rx.Resize(15);
    EXPECT_THROW(feed(Bytes({0x55})), VbError);
}

}  // namespace
}  // namespace maroset::test
