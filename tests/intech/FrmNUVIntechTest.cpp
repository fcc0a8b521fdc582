#include "drivers/intech/FrmNUVIntech.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "IntechFrames.h"
#include "core/TracePrinter.h"
#include "drivers/intech/IntechCollector.h"
#include "platform/serial/MemorySerialCable.h"
#include "support/ErrorOf.h"
#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using test::WithBcc;

// One line owner of node "Meter" ticking every 100 ms, an in-memory cable at /dev/ttyS0 whose
// device end the test speaks through, and the link trace recorded.
class IntechLine : public test::RuntimeFixture {
  protected:
    IntechLine() {
        runtime().serialDevices().plug("/dev/ttyS0", cable.hostEnd());
        frm->NodeName("Meter");
        frm->TmrScanRate.Interval(100);
        reads_ = frm->ReadComplete.subscribe([this](VbArray<Variant>& n, VbArray<Variant>& v) {
            EXPECT_EQ(n.LBound(), 0);
            EXPECT_EQ(n.UBound(), v.UBound());
            names.push_back(n.items());
            values.push_back(v.items());
        });
    }
    void poll(const std::vector<std::string>& commands) {
        for (size_t i = 0; i < commands.size(); ++i)
            frm->PollCommand(static_cast<int32_t>(i), commands[i]);
        frm->TmrScanRate.Enabled(true);
    }
    std::string sent() {
        advance(0ms);
        return cable.takeHostSent();
    }
    void answer(const std::string& bytes) {
        cable.deviceEnd()->write(bytes);
        advance(0ms);
    }
    bool traced(std::string_view part) const {
        for (const auto& l : trace)
            if (l.find(part) != std::string::npos) return true;
        return false;
    }

    platform::MemorySerialCable cable{loop()};
    std::shared_ptr<FrmNUVIntech> frm = std::make_shared<FrmNUVIntech>();
    std::vector<std::vector<Variant>> names, values;
    test::IncidentRecorder incidents_;
    std::vector<std::string>& trace = incidents_.lines;
    const std::string ok = WithBcc("@01OK:") + "\r";

  private:
    Subscription reads_;
};

TEST_F(IntechLine, OneTickWalksTheListUntilItWrapsAndAnythingButAGoodReplyEndsTheChain) {
    poll({"@01EX E5 00:", "@01EX DI:", "@02EX E1:"});
    EXPECT_FALSE(frm->MSComm1.PortOpen()) << "the port opens on the first send";
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
    answer(WithBcc("@01EX E6 123:") + "\r");  // a block it does not report still goes on
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer(ok);
    EXPECT_EQ(sent(), "@02EX E1:CF\r");
    answer(ok);
    EXPECT_EQ(sent(), "") << "the list wrapped: the next cycle waits for the tick";
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
    advance(100ms);  // no answer: no time-out, no resend, the next command
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer(WithBcc("@01ER:") + "\r");
    EXPECT_EQ(sent(), "");
    EXPECT_TRUE(traced("Meter: reply code \"ER\" unknown"));
    // Reading past the end enlarges the list; its empty entry goes out as "0" + CR.
    EXPECT_EQ(frm->PollCommand(3), "");
    advance(100ms);
    EXPECT_EQ(sent(), "@02EX E1:CF\r");
    answer(ok);
    EXPECT_EQ(sent(), "0\r");
    EXPECT_EQ(frm->PollIndex(), 0);
    EXPECT_TRUE(traced("Meter: sent @01EX E5 00:52<CR>"));
    EXPECT_TRUE(traced("Meter: received @01OK:35"));
    EXPECT_TRUE(names.empty());
}

TEST_F(IntechLine, ErrorsOfATickOrAReplyAreTracedAndTheNextTickGoesOn) {
    frm->TmrScanRate.Enabled(true);
    advance(100ms);  // nothing registered: Subscript out of range, nothing sent
    EXPECT_TRUE(traced("Meter: error 9 in Maroset.FrmNUVIntech: Subscript out of range"));
    EXPECT_FALSE(frm->MSComm1.PortOpen());

    runtime().mapSerialPort(1, "/nonexistent/intech", "meter");
    frm->PollCommand(0, "@01EX DI:");
    frm->PollCommand(1, "@01EX E1:");
    advance(100ms);
    EXPECT_TRUE(traced("Meter: cannot open port 1: Cannot open serial device /nonexistent/intech"));
    EXPECT_EQ(test::errorOf([&] { frm->SendCommand("@01EX DI:"); }), 8002);
    runtime().serialDevices().plug("/nonexistent/intech", cable.hostEnd());
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E1:CE\r");

    answer(WithBcc("@01EX DI 00x3 0015:") + "\r");  // a word that is not a number
    EXPECT_TRUE(traced("Meter: error 13 in Maroset.FrmNUVIntech: Type mismatch"));
    EXPECT_EQ(sent(), "");
    cable.cut("unplugged");
    EXPECT_TRUE(traced("Meter: line broken: unplugged"));
    platform::MemorySerialCable replugged(loop());
    runtime().serialDevices().plug("/nonexistent/intech", replugged.hostEnd());
    advance(100ms);
    EXPECT_EQ(replugged.takeHostSent(), "@01EX DI:E5\r");
}

TEST_F(IntechLine, DataRepliesAreDecodedFieldByField) {
    frm->RXData(WithBcc("@01EX DI 0003 0015:"));
    frm->RXData(
        WithBcc("@07EX E2 3FF 000 001 FFF abc 010 100 7FF 800 002 003 004 005 006 007 008:"));
    frm->RXData(WithBcc("@01EX E5 02 42C80000 3F800000 C2C80000 40490FDB:"));
    frm->RXData(WithBcc("@01EX E5 00 41200000 3F000000 00000000 42C8:"));  // last one cut short
    ASSERT_EQ(names.size(), 4u);
    // The masked bits themselves: LDO2 is 0 or 2, LDI4 0 or 8.
    EXPECT_EQ(names[0],
              (std::vector<Variant>{"01LDO1", "01LDO2", "01LDI1", "01LDI2", "01LDI3", "01LDI4"}));
    EXPECT_EQ(values[0], (std::vector<Variant>{int16_t(1), int16_t(2), int16_t(1), int16_t(2),
                                               int16_t(4), int16_t(8)}));
    ASSERT_EQ(names[1].size(), 16u);
    EXPECT_EQ(names[1].front(), Variant("07EAI17"));
    EXPECT_EQ(names[1].back(), Variant("07EAI32"));
    EXPECT_EQ(values[1], (std::vector<Variant>{"1023", "0", "1", "4095", "2748", "16", "256",
                                               "2047", "2048", "2", "3", "4", "5", "6", "7", "8"}));
    EXPECT_EQ(names[2], (std::vector<Variant>{"01LAI9", "01LAI10", "01LAI11", "01LAI12"}));
    EXPECT_EQ(values[2], (std::vector<Variant>{"100.0", "1.0", "-100.0", "3.1"}));
    EXPECT_EQ(names[3][0], Variant("01LAI1"));
    EXPECT_EQ(values[3], (std::vector<Variant>{"10.0", "0.5", "0.0", "0.0"}));
}

TEST_F(IntechLine, FramesFailingACheckAreDroppedWithTheReasonOnTheTrace) {
    poll({"@01EX DI:", "@01EX E1:"});
    advance(100ms);
    sent();
    const std::pair<std::string, const char*> bad[] = {
        {"@01OK:3", "too short (7 characters, at least 8)"},
        {"X01OK:35", "no \"@\" at the start"},
        {"@01OK;35", "no \":\" third from the end"},
        {"@01EX DI 0003 0015:ae", "BCC mismatch (computed AE, received ae)"},
        // "01OKzZ:" sums to 9: one digit, which two received ones never equal.
        {"@01OKzZ:09", "BCC mismatch (computed 9, received 09; a sum below 16 never matches)"},
    };
    for (const auto& [frame, why] : bad) {
        frm->RXData(frame);
        EXPECT_EQ(sent(), "") << frame;
        EXPECT_TRUE(traced(std::string("Meter: dropped reply: ") + why)) << frame;
    }
    // Noise, then a frame cut one character past its ":": the next frame ends one early.
    answer(std::string("\x00garbage\xff:", 10) + "@01OK:3");
    answer(WithBcc("@01EX DI 0000 0001:") + "\r");
    EXPECT_TRUE(traced("Meter: dropped 10 characters outside a frame: <0x00>garbage<0xFF>:"));
    EXPECT_TRUE(names.empty());
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E1:CE\r");
    answer(WithBcc("@01EX DI 0000 0001:") + "\r");
    EXPECT_EQ(names.size(), 1u);
}

TEST_F(IntechLine, BusyIsReadOnlyAndPLCWordCountReadsZero) {
    EXPECT_EQ(frm->Busy(), 0);
    EXPECT_EQ(test::errorOf([&] { frm->Busy(1); }), 382);
    frm->PLCWordCount(2);
    EXPECT_EQ(frm->PLCWordCount(), 0);
}

// What the trace tells a person about the line, each line checked by its words.
using IntechLineTrace = IntechLine;

TEST_F(IntechLineTrace, AReplyCutShortByANewAtSignIsToldAndTheNewFrameDecoded) {
    poll({"@01EX DI:"});
    advance(100ms);
    sent();
    answer("@01EX DI 00" + WithBcc("@01OK:") + "\r");
    EXPECT_TRUE(traced("Meter: reply cut short by a new \"@\" after 11 characters: @01EX DI 00"));
    EXPECT_TRUE(traced("Meter: received @01OK:35"));
    EXPECT_EQ(incidents_.find("cut short")->kind, platform::IncidentKind::Dropped);
}

TEST_F(IntechLineTrace, AnEndlessReplyIsDroppedWithOneLineAndTheNextReplyDecodes) {
    poll({"@01EX DI:"});
    advance(100ms);
    sent();
    answer("@01EX E1 " + std::string(3 * IntechCollector::FrameLimit, '7'));
    EXPECT_EQ(incidents_.count("reply longer than 512 characters: dropped"), 1u);
    answer(WithBcc("@01EX DI 0003 0015:") + "\r");
    EXPECT_EQ(names.size(), 1u) << "the reply after the endless one is decoded";
    EXPECT_TRUE(traced("characters outside a frame")) << "what came after the drop is counted";
}

TEST_F(IntechLineTrace, EveryIncidentNamesTheDeviceAndTheOpenSaysWhichPort) {
    poll({"@01EX DI:"});
    advance(100ms);
    EXPECT_TRUE(traced("Meter: opened port 1 (/dev/ttyS0, 9600,n,8,1)"));
    EXPECT_EQ(incidents_.find("sent @01EX DI:")->endpoint, "/dev/ttyS0");
}

TEST_F(IntechLineTrace, APortThatCannotOpenIsPrintedOnceThenSummarisedEveryTenSeconds) {
    std::vector<std::string> printed;
    TracePrinter printer(runtime().incidents(),
                         [&](std::string_view line) { printed.emplace_back(line); });
    runtime().mapSerialPort(1, "/nonexistent/intech", "meter");
    poll({"@01EX DI:"});
    advance(10'100ms);
    const std::string open =
        "Meter: 09:00:00.100 cannot open port 1: Cannot open serial device "
        "/nonexistent/intech";
    ASSERT_EQ(printed.size(), 4u) << ::testing::PrintToString(printed);
    EXPECT_EQ(printed[0].rfind(open, 0), 0u) << printed[0];
    EXPECT_EQ(printed[1].rfind("Meter: 09:00:00.100 error 8002 in Maroset.FrmNUVIntech: ", 0), 0u)
        << printed[1];
    EXPECT_TRUE(printed[2].starts_with("Meter: 09:00:10.100 cannot open port 1: ")) << printed[2];
    EXPECT_TRUE(printed[2].ends_with(" ... repeated 100 times")) << printed[2];
    EXPECT_TRUE(printed[3].ends_with(" ... repeated 100 times")) << printed[3];

    // One more failing tick, then plugged in: the run ends with what was left unsaid, and the
    // line opens.
    advance(100ms);
    EXPECT_EQ(printed.size(), 4u);
    runtime().serialDevices().plug("/nonexistent/intech", cable.hostEnd());
    printed.clear();
    advance(100ms);
    ASSERT_GE(printed.size(), 3u) << ::testing::PrintToString(printed);
    EXPECT_TRUE(printed[0].starts_with("Meter: 09:00:10.300 cannot open port 1: ")) << printed[0];
    EXPECT_TRUE(printed[0].ends_with(" ... repeated 1 times")) << printed[0];
    EXPECT_EQ(printed[2], "Meter: 09:00:10.300 opened port 1 (/nonexistent/intech, 9600,n,8,1)");
}

TEST_F(IntechLineTrace, ANodeWithNoTagAndTheEmptyPollEntryAreExplained) {
    frm->TmrScanRate.Enabled(true);
    advance(100ms);
    EXPECT_TRUE(
        traced("Meter: no poll command: the node has no tag, so each tick fails with "
               "error 9 until one is added"));
    frm->PollCommand(1, "");
    frm->PollCommand(0, "@01EX DI:");
    advance(100ms);
    answer(ok);
    EXPECT_TRUE(
        traced("Meter: sent 0<CR> (the poll list's empty entry, sent as the BCC of "
               "nothing)"));
}

}  // namespace
}  // namespace maroset
