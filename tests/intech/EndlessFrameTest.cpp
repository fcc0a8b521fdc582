#include "drivers/intech/IntechCollector.h"

#include <gtest/gtest.h>

#include <string>

#include "IntechFrames.h"
#include "support/ResidentMemory.h"

namespace maroset {
namespace {

// Feeds text one character at a time, as the port delivers it; the frames completed.
std::vector<std::string> feedAll(IntechCollector& c, std::string_view text) {
    std::vector<std::string> frames;
    for (size_t i = 0; i < text.size(); ++i)
        if (c.feed(text.substr(i, 1))) frames.push_back(c.RxBuffer());
    return frames;
}

TEST(IntechEndlessFrame, TwentyMegabytesWithoutAColonAreDroppedAndTheNextFrameIsDecoded) {
    IntechCollector c;
    const size_t before = test::ResidentBytes();
    EXPECT_TRUE(feedAll(c, "@01EX E1 0 ").empty());
    const std::string chunk(test::EndlessFrameChunk, '7');
    bool overran = false;
    for (size_t sent = 0; sent < test::EndlessFrameBytes; sent += chunk.size()) {
        EXPECT_TRUE(feedAll(c, chunk).empty());
        overran = overran || c.overran();
        c.takeOverrun();
        c.takeDropped();
    }
    EXPECT_TRUE(overran);
    EXPECT_LE(c.RxBuffer().capacity(), 2 * IntechCollector::FrameLimit);
    EXPECT_LT(test::ResidentBytes(), before + test::EndlessFrameGrowthLimit);

    const std::string good = test::WithBcc("@01OK:");
    EXPECT_EQ(feedAll(c, good + "\r"), std::vector<std::string>{good});
}

TEST(IntechEndlessFrame, AFrameUpToTheLimitIsKeptWhole) {
    IntechCollector c;
    const std::string longest = "@01EX " + std::string(IntechCollector::FrameLimit - 9, '0') + ":";
    const std::string frame = longest + "AB";
    ASSERT_EQ(frame.size(), IntechCollector::FrameLimit);
    EXPECT_EQ(feedAll(c, frame), std::vector<std::string>{frame});
    EXPECT_FALSE(c.overran());
}

TEST(IntechEndlessFrame, ANewAtSignTellsTheFrameItCutShort) {
    IntechCollector c;
    feedAll(c, "@01EX E");
    feedAll(c, "@");
    EXPECT_EQ(c.cutShort(), "@01EX E");
    c.takeCutShort();
    feedAll(c, "01OK:35");
    EXPECT_EQ(c.cutShort(), "") << "a frame that ended is not cut short";
}

}  // namespace
}  // namespace maroset
