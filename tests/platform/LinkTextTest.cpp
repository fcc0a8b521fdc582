#include "platform/LinkText.h"

#include <gtest/gtest.h>

#include <string>

namespace maroset::platform {
namespace {

TEST(LinkText, ShowsBytesReadably) {
    EXPECT_EQ(Hex(std::string("\x10\x02\x00\xff", 4)), "10 02 00 FF");
    EXPECT_EQ(Printable("@01EX:\r\n\x05\xe9"), "@01EX:<CR><LF><0x05><0xE9>");
}

TEST(LinkText, ADumpOverTheLimitKeepsItsHeadAndTailAndCountsTheRest) {
    const std::string whole(DumpWhole, 'a');
    EXPECT_EQ(Printable(whole), whole) << "a dump at the limit is shown whole";

    std::string flood =
        std::string(DumpHead, 'h') + std::string(1000, 'm') + std::string(DumpTail, 't');
    EXPECT_EQ(Printable(flood), std::string(DumpHead, 'h') + " ... 1000 bytes left out ... " +
                                    std::string(DumpTail, 't'));

    const std::string bytes(300, '\x10');
    const std::string hex = Hex(bytes);
    EXPECT_EQ(hex.find(" ... 140 bytes left out ... "), DumpHead * 3 - 1);
    EXPECT_EQ(hex.size(),
              (DumpHead + DumpTail) * 3 - 2 + std::string(" ... 140 bytes left out ... ").size());
}

}  // namespace
}  // namespace maroset::platform
