#include "platform/LinkTrace.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace maroset::platform {
namespace {

TEST(LinkTrace, WritesNothingWithoutASinkAndShowsBytesReadably) {
    LinkTrace trace;
    EXPECT_FALSE(trace.enabled());
    trace.write("Plc", "lost");
    std::vector<std::string> lines;
    trace.setSink([&](std::string_view line) { lines.emplace_back(line); });
    trace.write("Plc", "sent " + LinkTrace::Hex(std::string("\x10\x02\x00\xff", 4)));
    trace.write("Meter", "received " + LinkTrace::Printable("@01EX:\r\n\x05\xe9"));
    EXPECT_EQ(lines, (std::vector<std::string>{"Plc: sent 10 02 00 FF",
                                               "Meter: received @01EX:<CR><LF><0x05><0xE9>"}));
}

}  // namespace
}  // namespace maroset::platform
