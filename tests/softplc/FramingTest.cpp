#include "drivers/softplc/MessageFrame.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

#include "drivers/softplc/ArrivalSplitter.h"
#include "drivers/softplc/ModTCPIP.h"
#include "lang/Strings.h"
#include "sim/softplc/ServerFrames.h"

namespace maroset {
namespace {

struct WorkedExample {
    const char* type;
    int32_t number;
    const char* data;
    const char* frame;
    uint16_t crc;
};

// The frames this program produces, with their CRC values, as the server expects them.
const WorkedExample kExamples[] = {
    {"TSL", 1, " ", "<%TSL001;~ ;~003242%>", 0x03F2},
    {"ACK", 2, "005", "<%ACK002;~005;~198158%>", 0xC69E},
    {"NAK", 3, " ", "<%NAK003;~ ;~134230%>", 0x86E6},
    {"RSL", 4, " ", "<%RSL004;~ ;~011175%>", 0x0BAF},
};

TEST(SoftPlcFrames, BuildTheWorkedExamplesByteForByte) {
    for (const auto& e : kExamples) {
        EXPECT_EQ(MessageFrame::Build(e.type, e.number, e.data), e.frame);
        // The server's own writer agrees, though written apart.
        EXPECT_EQ(sim::ServerFrame::Write(e.type, e.number, e.data), e.frame);
        const std::string frame = e.frame;
        const std::string body = frame.substr(0, frame.size() - 8);
        EXPECT_EQ(ModTCPIP::MessageCRC(body), frame.substr(frame.size() - 8, 6));
        // The six digits are the high and the low byte of the CRC, in decimal.
        const std::string digits = ModTCPIP::MessageCRC(body);
        EXPECT_EQ(std::stoi(digits.substr(0, 3)) * 256 + std::stoi(digits.substr(3)), e.crc);
    }
}

TEST(SoftPlcFrames, CrcRoutinesFoldInPlaceAndRenderEveryByteAsThreeDigits) {
    uint16_t crc = 0;
    for (const char c : std::string("123456789")) {
        const uint16_t returned = ModTCPIP::CRCThisByte(static_cast<uint8_t>(c), crc);
        EXPECT_EQ(returned, crc);
    }
    EXPECT_EQ(crc, 0xBB3D);  // the standard check value, without the ETX
    EXPECT_EQ(ModTCPIP::WordToByte(0xBB3D, true), 0xBB);
    EXPECT_EQ(ModTCPIP::WordToByte(0xBB3D, false), 0x3D);
    // Bytes below 100 and below 10 keep their leading zeros; a body of every byte value
    // passes through unchanged.
    std::string all;
    for (int b = 0; b < 256; ++b) all += static_cast<char>(b);
    const std::string digits = ModTCPIP::MessageCRC(all);
    ASSERT_EQ(digits.size(), 6u);
    EXPECT_EQ(digits.find_first_not_of("0123456789"), std::string::npos);
    EXPECT_EQ(digits, sim::ServerFrame::Check(all));
}

TEST(SoftPlcFrames, TypeAndNumberAreFormattedAsTheLayoutSays) {
    EXPECT_EQ(MessageFrame::Build("AB", 0, "x").substr(0, 10), "<% AB000;~");
    EXPECT_EQ(MessageFrame::Build("NTV", 999, "1;~5;~7").substr(0, 19), "<%NTV999;~1;~5;~7;~");
    EXPECT_EQ(MessageFrame::Build("NTV", 42, "").size(), 20u);  // the shortest frame
}

TEST(SoftPlcFrames, JudgesPiecesByLengthAndCrcOnly) {
    using V = MessageFrame::Verdict;
    EXPECT_EQ(MessageFrame::Judge("").verdict, V::Empty);
    for (size_t n = 1; n <= 10; ++n)
        EXPECT_EQ(MessageFrame::Judge(std::string(n, 'x')).verdict, V::TooShort) << n;
    EXPECT_EQ(MessageFrame::Judge("xxxxxxxxxxx").verdict, V::BadCrc);  // 11: checked

    std::string frame = MessageFrame::Build("NTV", 7, "1;~5;~42");
    std::string piece = frame.substr(0, frame.size() - 2);
    auto good = MessageFrame::Judge(piece);
    EXPECT_EQ(good.verdict, V::Good);
    EXPECT_EQ(good.type, "NTV");
    EXPECT_EQ(good.number, "007");
    EXPECT_EQ(good.payload, ";~1;~5;~42;~");

    std::string wrong = piece;
    wrong[wrong.size() - 1] = wrong.back() == '0' ? '1' : '0';
    EXPECT_EQ(MessageFrame::Judge(wrong).verdict, V::BadCrc);
    wrong = piece;
    wrong.replace(wrong.size() - 6, 6, "00a242");  // not digits at all
    EXPECT_EQ(MessageFrame::Judge(wrong).verdict, V::BadCrc);

    // The start delimiter is not examined: only the CRC decides.
    std::string body = "XYACK009;~012;~";
    auto odd = MessageFrame::Judge(body + ModTCPIP::MessageCRC(body));
    EXPECT_EQ(odd.verdict, V::Good);
    EXPECT_EQ(odd.type, "ACK");
    EXPECT_EQ(odd.payload, ";~012;~");
}

std::vector<std::string> splitAll(const std::string& text, size_t chunk) {
    ArrivalSplitter s;
    for (size_t at = 0; at < text.size(); at += chunk)
        s.feed(std::string_view(text).substr(at, chunk));
    s.finish();
    std::vector<std::string> pieces;
    for (std::string p; s.next(p);) pieces.push_back(p);
    return pieces;
}

TEST(SoftPlcArrivalSplitter, CutsExactlyAsSplitAtTheDelimiterInAnyChunking) {
    const std::vector<std::string> samples = {
        "", "%>", "abc", "a%>b%>", "%%>", "%%%>>", "a%", "%", ">%>", "x%>%>y", "<%A%>%<%B",
    };
    std::mt19937 random(7);
    std::vector<std::string> inputs = samples;
    for (int i = 0; i < 300; ++i) {
        std::string s;
        const int n = static_cast<int>(random() % 20);
        for (int j = 0; j < n; ++j) s += "%>ab"[random() % 4];
        inputs.push_back(s);
    }
    for (const auto& text : inputs) {
        const auto expected = Split(text, "%>").items();
        // An empty arrival is one empty piece to the splitter, none to Split: both mean
        // nothing to do.
        const auto wanted = text.empty() ? std::vector<std::string>{""} : expected;
        for (size_t chunk : {size_t{1}, size_t{2}, size_t{3}, text.size() + 1})
            EXPECT_EQ(splitAll(text, chunk), wanted) << '"' << text << "\" in chunks of " << chunk;
    }
}

TEST(SoftPlcServerFrames, ReassembleAcrossArrivalsAndRejectMalformedUnits) {
    sim::ServerFrameReader reader;
    const std::string frame = sim::ServerFrame::Write("NTV", 12, "1;~5;~x");
    reader.feed(frame.substr(0, 7));
    std::string unit;
    EXPECT_FALSE(reader.next(unit));
    reader.feed(frame.substr(7) + frame.substr(0, 3));
    ASSERT_TRUE(reader.next(unit));
    const auto read = sim::ServerFrame::Read(unit);
    ASSERT_TRUE(read);
    EXPECT_EQ(read->type, "NTV");
    EXPECT_EQ(read->number, 12);
    EXPECT_EQ(read->data, "1;~5;~x");
    EXPECT_FALSE(sim::ServerFrame::Read("<%NTV0a1;~;~000000"));
    EXPECT_FALSE(sim::ServerFrame::Read(unit.substr(1)));
}

}  // namespace
}  // namespace maroset
