#include "drivers/df1/Df1Receiver.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Df1Line.h"
#include "core/Procedure.h"
#include "support/ResidentMemory.h"

namespace maroset {
namespace {

// The receiver's owner reduced to what it is told: each frame as RxBuffer holds it.
class FrameLog final : public Df1Receiver::Link {
  public:
    explicit FrameLog(const Df1Receiver& rx) : rx_(rx) {}
    void restartEndOfMessage() override {}
    void stopEndOfMessage() override {}
    bool frameReceived() override {
        std::string frame;
        for (int32_t i = 0; i < rx_.RxCount; ++i) frame += static_cast<char>(rx_.RxBuffer(i));
        frames.push_back(frame);
        return true;
    }
    bool controlReceived(uint8_t) override { return true; }

    std::vector<std::string> frames;

  private:
    const Df1Receiver& rx_;
};

using Df1EndlessFrame = test::RuntimeFixture;

TEST_F(Df1EndlessFrame, TwentyMegabytesWithoutAnEndKeepTheBufferAndTheNextFrameIsDecoded) {
    Df1Receiver rx(17);
    FrameLog log(rx);
    Procedure proc("Df1EndlessFrame", "feed");
    auto feed = [&](std::string_view bytes) {
        for (const char b : bytes) ASSERT_TRUE(rx.feed(static_cast<uint8_t>(b), log, proc));
    };
    const size_t before = test::ResidentBytes();
    feed(test::Bytes({0x10, 0x02}));
    const std::string chunk(test::EndlessFrameChunk, 'A');
    for (size_t sent = 0; sent < test::EndlessFrameBytes; sent += chunk.size()) feed(chunk);
    EXPECT_TRUE(log.frames.empty());
    EXPECT_EQ(rx.RxCount, 17) << "the buffer's last cell is overwritten, never grown past";
    EXPECT_LT(test::ResidentBytes(), before + test::EndlessFrameGrowthLimit);

    // The next DLE STX ends the endless frame (handed on, to fail its check) and starts anew.
    const std::string body = test::ReadReply(7, {1, 2});
    feed(test::Df1Frame(body));
    ASSERT_EQ(log.frames.size(), 2u);
    EXPECT_EQ(log.frames[1].substr(0, body.size()), body);
}

}  // namespace
}  // namespace maroset
