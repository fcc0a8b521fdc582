#include "drivers/intech/FrmNUVIntech.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "IntechFrames.h"
#include "platform/serial/MemorySerialCable.h"
#include "support/ErrorOf.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using namespace std::chrono_literals;
using test::WithBcc;

// One line owner on port 1 of node "Meter", an in-memory cable at /dev/ttyS0 whose device end
// the test speaks through, and the link trace recorded.
class IntechLine : public test::RuntimeFixture {
  protected:
    struct Read {
        std::vector<Variant> names, values;
        int32_t namesUBound, valuesUBound;
    };

    IntechLine() {
        runtime().serialDevices().plug("/dev/ttyS0", cable.hostEnd());
        runtime().trace().setSink([this](std::string_view l) { trace.emplace_back(l); });
        frm->NodeName("Meter");
        frm->CommPort(1);
        frm->CommSettings("9600,n,8,1");
        frm->TmrScanRate.Interval(100);
        reads_ = frm->ReadComplete.subscribe([this](VbArray<Variant>& n, VbArray<Variant>& v) {
            reads.push_back({n.items(), v.items(), n.UBound(), v.UBound()});
        });
    }

    void poll(std::vector<std::string> commands) {
        for (size_t i = 0; i < commands.size(); ++i)
            frm->PollCommand(static_cast<int32_t>(i), commands[i]);
        frm->TmrScanRate.Enabled(true);
    }
    // What the host wrote since the last call, after letting the loop deliver.
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
    std::vector<Read> reads;
    std::vector<std::string> trace;

  private:
    Subscription reads_;
};

const std::string kOk = WithBcc("@01OK:") + "\r";

using IntechPollChain = IntechLine;

TEST_F(IntechPollChain, OneTickWalksTheListOneCommandPerGoodReplyAndStopsAtTheWrap) {
    poll({"@01EX E5 00:", "@01EX DI:", "@02EX E1:"});
    EXPECT_EQ(sent(), "") << "nothing before the first tick";
    EXPECT_FALSE(frm->MSComm1.PortOpen()) << "the port opens on the first send";
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
    EXPECT_TRUE(frm->MSComm1.PortOpen());
    answer(WithBcc("@01EX E5 00 42C80000 3F800000 00000000 C2C80000:") + "\r");
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer(kOk);  // an acknowledgement goes on too
    EXPECT_EQ(sent(), "@02EX E1:CF\r");
    EXPECT_EQ(frm->PollIndex(), 0);
    answer(kOk);
    EXPECT_EQ(sent(), "") << "the list wrapped: the next cycle waits for the tick";
    advance(99ms);
    EXPECT_EQ(sent(), "");
    advance(1ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
    EXPECT_TRUE(traced("Meter: sent @01EX E5 00:52<CR>"));
    EXPECT_TRUE(traced("Meter: received @01OK:35"));
}

TEST_F(IntechPollChain, WithoutAGoodReplyTheNextTickSendsTheCommandAfterTheLastOneSent) {
    poll({"@01EX E5 00:", "@01EX DI:", "@01EX E2:"});
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
    advance(100ms);  // no answer, no time-out, no resend
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer("@01OK:36\r");  // wrong BCC: dropped
    EXPECT_EQ(sent(), "");
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E2:CF\r");
    // An answer with a reply code it does not know stops the chain as well.
    answer(WithBcc("@01ER:") + "\r");
    EXPECT_EQ(sent(), "");
    EXPECT_TRUE(traced("reply code \"ER\" unknown"));
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E5 00:52\r");
}

TEST_F(IntechPollChain, AnEmptyEntryGoesOutAsZeroAndCarriageReturn) {
    poll({"@01EX DI:"});
    EXPECT_EQ(frm->PollCommand(2), "") << "reading past the end enlarges the list";
    EXPECT_EQ(frm->PollCommandUBound(), 2);
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer(kOk);
    EXPECT_EQ(sent(), "0\r");
    advance(100ms);
    EXPECT_EQ(sent(), "0\r");
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
}

TEST_F(IntechPollChain, ATickBeforeAnyCommandFailsWithSubscriptOutOfRangeAndSendsNothing) {
    frm->TmrScanRate.Enabled(true);
    advance(100ms);
    EXPECT_EQ(sent(), "");
    EXPECT_FALSE(frm->MSComm1.PortOpen());
    EXPECT_TRUE(traced("Meter: error 9 in Maroset.FrmNUVIntech: Subscript out of range"));
    // The loop goes on; once a command is there, the next tick sends it.
    frm->PollCommand(0, "@01EX DI:");
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
}

TEST_F(IntechPollChain, ADeviceThatCannotBeOpenedIsTracedAndTheNextTickTriesAgain) {
    runtime().mapSerialPort(1, "/nonexistent/intech-line", "meter");
    poll({"@01EX DI:"});
    advance(100ms);
    EXPECT_TRUE(traced("Meter: cannot open port 1: "));
    EXPECT_TRUE(traced("/nonexistent/intech-line"));
    EXPECT_EQ(test::errorOf([&] { frm->SendCommand("@01EX DI:"); }), 8002);
    // Plugged in: the next tick opens it and polls.
    runtime().serialDevices().plug("/nonexistent/intech-line", cable.hostEnd());
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
}

TEST_F(IntechPollChain, ALineThatBreaksIsOpenedAgainByTheNextSend) {
    poll({"@01EX DI:"});
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    cable.cut("unplugged");
    EXPECT_FALSE(frm->MSComm1.PortOpen());
    EXPECT_TRUE(traced("Meter: line broken: unplugged"));
    platform::MemorySerialCable replugged(loop());
    runtime().serialDevices().plug("/dev/ttyS0", replugged.hostEnd());
    advance(100ms);
    EXPECT_EQ(replugged.takeHostSent(), "@01EX DI:E5\r");
}

TEST_F(IntechPollChain, UnloadStopsPollingEvenFromInsideAReadCompleteHandler) {
    poll({"@01EX DI:", "@01EX E1:"});
    auto unload = frm->ReadComplete.subscribe([&](VbArray<Variant>&, VbArray<Variant>&) {
        frm->Unload();
        frm.reset();  // released by the handler, as a host dropping its node does
    });
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX DI:E5\r");
    answer(WithBcc("@01EX DI 0000 0001:") + "\r");
    EXPECT_EQ(reads.size(), 1u);
    EXPECT_EQ(sent(), "") << "a released owner sends nothing more";
    advance(500ms);
    EXPECT_EQ(sent(), "");
}

using IntechReplies = IntechLine;

TEST_F(IntechReplies, DigitalStatusGivesOutputsThenInputsAsTheMaskedBits) {
    frm->RXData(WithBcc("@01EX DI 0003 0015:"));
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].namesUBound, 5);
    EXPECT_EQ(reads[0].names,
              (std::vector<Variant>{"01LDO1", "01LDO2", "01LDI1", "01LDI2", "01LDI3", "01LDI4"}));
    EXPECT_EQ(reads[0].values, (std::vector<Variant>{int16_t(1), int16_t(2), int16_t(1), int16_t(2),
                                                     int16_t(4), int16_t(8)}));
    frm->RXData(WithBcc("@07EX DI 0002 0010:"));
    EXPECT_EQ(reads[1].names[0], Variant("07LDO1"));
    EXPECT_EQ(reads[1].values, (std::vector<Variant>{int16_t(0), int16_t(2), int16_t(0), int16_t(2),
                                                     int16_t(0), int16_t(8)}));
}

TEST_F(IntechReplies, ExtendedBlocksGiveSixteenWholeNumbersFromTheirBlocksBase) {
    std::string body = "@01EX E2";
    const char* digits[16] = {"3FF", "000", "001", "FFF", "abc", "010", "100", "7FF",
                              "800", "002", "003", "004", "005", "006", "007", "008"};
    for (const char* d : digits) body += std::string(" ") + d;
    frm->RXData(WithBcc(body + ":"));
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].valuesUBound, 15);
    EXPECT_EQ(reads[0].names.front(), Variant("01EAI17"));
    EXPECT_EQ(reads[0].names.back(), Variant("01EAI32"));
    const std::vector<Variant> expected = {"1023", "0", "1", "4095", "2748", "16", "256", "2047",
                                           "2048", "2", "3", "4",    "5",    "6",  "7",   "8"};
    EXPECT_EQ(reads[0].values, expected);

    frm->RXData(
        WithBcc("@02EX E4 001 002 003 004 005 006 007 008 009 00A 00B 00C 00D 00E 00F 010:"));
    EXPECT_EQ(reads[1].names.front(), Variant("02EAI49"));
    EXPECT_EQ(reads[1].names.back(), Variant("02EAI64"));
    EXPECT_EQ(reads[1].values.back(), Variant("16"));
}

TEST_F(IntechReplies, AnalogGroupsGiveFourSinglesWithOneDecimal) {
    frm->RXData(WithBcc("@01EX E5 02 42C80000 3F800000 C2C80000 40490FDB:"));
    ASSERT_EQ(reads.size(), 1u);
    EXPECT_EQ(reads[0].names, (std::vector<Variant>{"01LAI9", "01LAI10", "01LAI11", "01LAI12"}));
    EXPECT_EQ(reads[0].values, (std::vector<Variant>{"100.0", "1.0", "-100.0", "3.1"}));
    // A value cut short is not eight digits long and reads as 0.
    frm->RXData(WithBcc("@01EX E5 00 41200000 3F000000 00000000 42C8:"));
    EXPECT_EQ(reads[1].names[0], Variant("01LAI1"));
    EXPECT_EQ(reads[1].values, (std::vector<Variant>{"10.0", "0.5", "0.0", "0.0"}));
}

TEST_F(IntechReplies, OtherBlocksAndAcknowledgementsReportNothingButContinueTheChain) {
    poll({"@01EX DI:", "@01EX E1:", "@01EX E2:"});
    advance(100ms);
    sent();
    answer(WithBcc("@01EX E6 123:") + "\r");
    EXPECT_EQ(sent(), "@01EX E1:CE\r");
    answer(kOk);
    EXPECT_EQ(sent(), "@01EX E2:CF\r");
    EXPECT_TRUE(reads.empty());
}

TEST_F(IntechReplies, FramesFailingACheckAreDroppedWithTheReasonOnTheTrace) {
    poll({"@01EX DI:", "@01EX E1:"});
    advance(100ms);
    sent();
    struct Bad {
        std::string frame;
        const char* why;
    };
    const Bad bad[] = {
        {"@01OK:3", "too short (7 characters, at least 8)"},
        {"X01OK:35", "no \"@\" at the start"},
        {"@01OK;35", "no \":\" third from the end"},
        {"@01OK:53", "BCC mismatch (computed 35, received 53)"},
        {"@01EX DI 0003 0015:ae", "BCC mismatch (computed AE, received ae)"},
        // The sum of "01OKzZ:" is 9: one digit, which two received ones never equal.
        {"@01OKzZ:09", "BCC mismatch (computed 9, received 09; a sum below 16 never matches)"},
    };
    for (const Bad& b : bad) {
        trace.clear();
        frm->RXData(b.frame);
        EXPECT_EQ(sent(), "") << b.frame;
        EXPECT_TRUE(traced(std::string("Meter: dropped reply: ") + b.why)) << b.frame;
    }
    EXPECT_TRUE(reads.empty());
}

TEST_F(IntechReplies, ADataFieldThatIsNotANumberEndsTheReplyWithATypeMismatch) {
    poll({"@01EX DI:", "@01EX E1:"});
    advance(100ms);
    sent();
    answer(WithBcc("@01EX DI 00x3 0015:") + "\r");
    EXPECT_TRUE(reads.empty());
    EXPECT_EQ(sent(), "");
    EXPECT_TRUE(traced("Meter: error 13 in Maroset.FrmNUVIntech: Type mismatch"));
    EXPECT_EQ(test::errorOf([&] { frm->RXData(WithBcc("@01EX E1 3FF xyz:")); }), 13);
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E1:CE\r") << "the next tick polls on";
}

TEST_F(IntechReplies, NoiseAndACutFrameCostOneReplyAtMost) {
    poll({"@01EX DI:", "@01EX E1:", "@01EX E2:"});
    advance(100ms);
    sent();
    // Noise, then a frame cut one character past its ":": the next frame ends one early.
    answer(std::string("\x00garbage\xff:", 10) + "@01OK:3");
    answer(WithBcc("@01EX DI 0000 0001:") + "\r");
    EXPECT_TRUE(reads.empty());
    EXPECT_TRUE(traced("Meter: dropped 10 characters outside a frame: <0x00>garbage<0xFF>:"));
    EXPECT_TRUE(traced("Meter: dropped reply: no \":\" third from the end"));
    advance(100ms);
    EXPECT_EQ(sent(), "@01EX E1:CE\r");
    answer(WithBcc("@01EX DI 0000 0001:") + "\r");
    EXPECT_EQ(reads.size(), 1u);
}

using IntechLineProperties = IntechLine;

TEST_F(IntechLineProperties, StoredOnlyPropertiesAndTheReadOnlyBusy) {
    EXPECT_EQ(std::string(FrmNUVIntech::Caption), "INTECH Driver");
    EXPECT_EQ(frm->Busy(), 0);
    EXPECT_EQ(test::errorOf([&] { frm->Busy(1); }), 382);
    frm->PLCWordCount(2);
    EXPECT_EQ(frm->PLCWordCount(), 0);
    frm->CommTimeOut(1000);
    EXPECT_EQ(frm->TmrCommsTimeOut.Interval(), 1000);
    EXPECT_EQ(test::errorOf([&] { frm->CommSettings("9600,x,8,1"); }), 380);
    frm->SendCommand("@01EX DI:");
    EXPECT_EQ(test::errorOf([&] { frm->CommPort(2); }), 8005) << "not while the port is open";
    // The poll list keeps its entries as it grows.
    frm->PollCommand(0, "a");
    frm->PollCommand(3, "d");
    EXPECT_EQ(frm->PollCommandUBound(), 3);
    EXPECT_EQ(frm->PollCommand(0), "a");
    EXPECT_EQ(frm->PollCommand(1), "");
    EXPECT_EQ(test::errorOf([&] { frm->PollCommand(-1); }), 9);
}

}  // namespace
}  // namespace maroset
