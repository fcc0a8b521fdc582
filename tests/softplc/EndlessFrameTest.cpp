#include "drivers/softplc/ArrivalSplitter.h"

#include <gtest/gtest.h>

#include <string>

#include "drivers/softplc/MessageFrame.h"
#include "support/ResidentMemory.h"

namespace maroset {
namespace {

TEST(SoftPlcEndlessFrame, TwentyMegabytesWithoutADelimiterAreCutAndTheNextFrameIsJudgedGood) {
    const size_t before = test::ResidentBytes();
    ArrivalSplitter splitter;
    const std::string chunk(test::EndlessFrameChunk, 'x');
    splitter.feed("<%NTV001;~");
    for (size_t sent = 0; sent < test::EndlessFrameBytes; sent += chunk.size())
        splitter.feed(chunk);
    EXPECT_TRUE(splitter.overlong());
    EXPECT_LT(test::ResidentBytes(), before + test::EndlessFrameGrowthLimit);

    const std::string good = MessageFrame::Build("NTV", 2, "1;~5");
    splitter.feed("%>" + good);
    splitter.finish();
    std::string piece;
    ASSERT_TRUE(splitter.next(piece));
    EXPECT_EQ(piece.size(), ArrivalSplitter::PieceLimit);
    EXPECT_NE(MessageFrame::Judge(piece).verdict, MessageFrame::Verdict::Good)
        << "judged on its start, it fails as the whole would";
    ASSERT_TRUE(splitter.next(piece));
    const auto judged = MessageFrame::Judge(piece);
    EXPECT_EQ(judged.verdict, MessageFrame::Verdict::Good) << piece;
    EXPECT_EQ(judged.type, "NTV");
}

TEST(SoftPlcEndlessFrame, APieceUpToTheLimitIsKeptWhole) {
    ArrivalSplitter splitter;
    splitter.feed(std::string(ArrivalSplitter::PieceLimit, 'y'));
    splitter.feed("%>");
    EXPECT_FALSE(splitter.overlong());
    std::string piece;
    ASSERT_TRUE(splitter.next(piece));
    EXPECT_EQ(piece.size(), ArrivalSplitter::PieceLimit);
}

}  // namespace
}  // namespace maroset
