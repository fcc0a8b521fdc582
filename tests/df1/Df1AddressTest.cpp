#include <gtest/gtest.h>

#include <string>

#include "Df1Line.h"
#include "drivers/df1/FrmNUVProSerial.h"
#include "support/ErrorOf.h"

namespace maroset::test {
namespace {

class Df1Address : public Df1LineFixture {
  protected:
    Variant check(const char* address) {
        owner.PLCAddress(Variant(address));
        return owner.CheckAddress();
    }
    FrmNUVProSerial owner{"PLC"};
};

TEST_F(Df1Address, AcceptsEachFileTypeOnlyWithItsFileNumbers) {
    const Variant invalid("Invalid PLC Address");
    struct Case {
        const char* address;
        bool good;
        const char* code;
    };
    for (const Case& c : {Case{"N7:0", true, "&H89"},
                          {"N10:5", true, "&H89"},
                          {"N5:0", false, "&H89"},
                          {"B3:0/2", true, "&H85"},
                          {"B4:0", false, "&H85"},
                          {"T4:1", true, "&H86"},
                          {"C5:0", true, "&H87"},
                          {"R6:0", true, "&H88"},
                          {"F8:0", true, "&H8A"},
                          {"F7:0", false, "&H8A"},
                          {"S2:1", true, "&H84"},
                          {"O0:1", true, "&H8B"},
                          {"I1:0", true, "&H8C"},
                          {"ST9:1", true, "&H8D"},
                          {"ST8:1", false, "&H8D"},
                          {"N300:0", false, "&H89"},
                          {"N7:256", false, "&H89"},
                          {"N7:255", true, "&H89"}}) {
        EXPECT_EQ(check(c.address), c.good ? Variant() : invalid) << c.address;
        EXPECT_EQ(owner.FileTypeCode(), c.code) << c.address;
    }
    EXPECT_EQ(check("X7:0"), invalid);
    EXPECT_EQ(owner.FileType(), "X");
}

TEST_F(Df1Address, SplitsElementAndSubElementAtAPointOrASlash) {
    check("ST9:12");
    EXPECT_EQ(owner.FileType(), "ST");
    EXPECT_EQ(owner.FileNumber(), 9);
    EXPECT_EQ(owner.ElementText(), "12");
    EXPECT_EQ(owner.SubElementText(), "0");
    check("b3:4/15");
    EXPECT_EQ(owner.FileType(), "B");
    EXPECT_EQ(owner.ElementText(), "4");
    EXPECT_EQ(owner.SubElementText(), "15");
    EXPECT_EQ(check("t4:0.acc"), Variant());
    EXPECT_EQ(owner.SubElementText(), "ACC");
}

TEST_F(Df1Address, TextThatIsNoAddressFailsWithTheConversionsError) {
    EXPECT_EQ(errorOf([&] { check("N7:abc"); }), 13);
    EXPECT_EQ(errorOf([&] { check("N7:"); }), 13);
    EXPECT_EQ(errorOf([&] { check("Nx:1"); }), 13);
    EXPECT_EQ(errorOf([&] { check("N7"); }), 5);  // no colon: a negative length
    EXPECT_EQ(errorOf([&] { check(""); }), 5);
    EXPECT_EQ(errorOf([&] { check("N70000:1"); }), 6);

    // A sub-element that is not a number fails when the request is built, nothing is sent.
    owner.PLCWordCount(1);
    owner.PLCFunction(Variant(int16_t{1}));
    check("T4:0.ACC");
    EXPECT_EQ(errorOf([&] { owner.RefreshData(); }), 13);
    EXPECT_EQ(hostSent(), "");
    // More words than a byte size can say overflow the same way.
    check("N7:0");
    owner.PLCWordCount(128);
    EXPECT_EQ(errorOf([&] { owner.RefreshData(); }), 6);
}

TEST_F(Df1Address, WithTheTrapOnAFailingStatementIsLoggedRetriedAndSkipped) {
    runtime().trap().setEnabled(true);
    owner.PLCWordCount(1);
    owner.PLCFunction(Variant(int16_t{1}));
    owner.PLCAddress(Variant("T4:0.ACC"));
    owner.RefreshData();
    EXPECT_EQ(errorLogRecords(), 6u);
    // The sub-element byte is skipped (0) and the request still goes out.
    EXPECT_EQ(hostSent(), Df1Frame(Bytes({0, 0, 0x0F, 0, 1, 0, 0xA2, 2, 4, 0x86, 0, 0})));
}

}  // namespace
}  // namespace maroset::test
