#include "platform/serial/SerialPort.h"

#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/PollEventLoop.h"
#include "platform/VirtualEventLoop.h"
#include "platform/serial/MemorySerialCable.h"
#include "platform/serial/PseudoTerminal.h"
#include "platform/serial/SerialDevices.h"
#include "platform/serial/SerialSettings.h"
#include "support/ErrorOf.h"

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;

TEST(SerialSettingsText, ParsesEveryFieldAndRefusesAnythingElseWith380) {
    const auto s = SerialSettings::Parse("19200,n,8,1");
    EXPECT_EQ(s.baud, 19200);
    EXPECT_EQ(s.parity, SerialSettings::Parity::None);
    EXPECT_EQ(s.dataBits, 8);
    EXPECT_EQ(s.stopBits, SerialSettings::StopBits::One);
    const auto t = SerialSettings::Parse(" 9600 , E , 7 , 1.5 ");
    EXPECT_EQ(t.text(), "9600,e,7,1.5");
    EXPECT_EQ(SerialSettings::Parse("300,M,5,2").text(), "300,m,5,2");
    EXPECT_EQ(SerialSettings::Parse("1200,s,6,1").parity, SerialSettings::Parity::Space);
    EXPECT_EQ(SerialSettings::Parse("1200,o,6,1").parity, SerialSettings::Parity::Odd);
    for (const char* bad :
         {"", "19200", "19200,n,8", "19200,x,8,1", "19200,n,9,1", "19200,n,4,1", "19200,n,8,3",
          "fast,n,8,1", "0,n,8,1", "-9600,n,8,1", "19200,no,8,1", "19200,n,8,1,1"})
        EXPECT_EQ(test::errorOf([&] { SerialSettings::Parse(bad); }), 380) << bad;
}

// A port on the virtual clock, its device an in-memory cable plugged in at /dev/ttyS0.
class SerialPortOnCable : public ::testing::Test {
  protected:
    SerialPortOnCable() {
        devices.plug("/dev/ttyS0", cable->hostEnd());
        cable->deviceEnd()->listen({[this](std::string_view b) { atDevice.append(b); }, {}});
        sub = port.OnComm.subscribe([this] {
            ++events;
            if (onComm) onComm();
        });
    }
    void turn() { loop.advance(milliseconds(0)); }

    VirtualEventLoop loop;
    SerialDevices devices{loop};
    std::unique_ptr<MemorySerialCable> cable = std::make_unique<MemorySerialCable>(loop);
    SerialPort port{devices, [](int16_t n) { return "/dev/ttyS" + std::to_string(n - 1); }};
    std::string atDevice;
    int events = 0;
    std::function<void()> onComm;
    Subscription sub;
};

TEST_F(SerialPortOnCable, RaisesOneReceiveEventPerByteAndInputTakesInputLenBytes) {
    port.RThreshold(1);
    port.InputLen(1);
    std::string read;
    onComm = [&] { read += port.Input(); };
    port.PortOpen(true);
    cable->deviceEnd()->write(std::string("\x10\x02\x00\xff", 4));
    EXPECT_EQ(events, 0) << "bytes arrive on the loop, not inside the writer's call";
    turn();
    EXPECT_EQ(events, 4);
    EXPECT_EQ(read, std::string("\x10\x02\x00\xff", 4));

    onComm = nullptr;  // nobody reads: the bytes wait in the buffer
    cable->deviceEnd()->write("abc");
    turn();
    EXPECT_EQ(port.InBufferCount(), 3);
    EXPECT_EQ(port.Input(), "a");
    port.InputLen(0);
    EXPECT_EQ(port.Input(), "bc");
    EXPECT_EQ(port.Input(), "");

    port.RThreshold(0);  // no events, bytes still buffered
    cable->deviceEnd()->write("z");
    turn();
    EXPECT_EQ(events, 7);
    EXPECT_EQ(port.Input(), "z");
}

TEST_F(SerialPortOnCable, WritesPassEveryByteAndAClosedPortRefusesOutput) {
    EXPECT_EQ(test::errorOf([&] { port.Output("x"); }), 8018);
    port.PortOpen(true);
    EXPECT_EQ(test::errorOf([&] { port.CommPort(2); }), 8005);
    const std::string all = [] {
        std::string s;
        for (int b = 0; b < 256; ++b) s += static_cast<char>(b);
        return s;
    }();
    port.Output(all);
    turn();
    EXPECT_EQ(atDevice, all);
    EXPECT_EQ(cable->hostSent(), all);
    port.PortOpen(false);
    cable->deviceEnd()->write("lost");  // nobody listens on a closed port
    turn();
    port.PortOpen(true);
    EXPECT_EQ(port.InBufferCount(), 0);
}

TEST_F(SerialPortOnCable, AHandlerMayCloseOrDestroyThePortInTheMiddleOfAChunk) {
    port.RThreshold(1);
    port.PortOpen(true);
    onComm = [&] { port.PortOpen(false); };
    cable->deviceEnd()->write("abc");
    turn();
    EXPECT_EQ(events, 1);

    auto owned = std::make_unique<SerialPort>(devices, [](int16_t) { return "/dev/ttyS0"; });
    owned->RThreshold(1);
    int seen = 0;
    auto s = owned->OnComm.subscribe([&] {
        ++seen;
        owned.reset();
    });
    owned->PortOpen(true);
    cable->deviceEnd()->write("abc");
    turn();
    EXPECT_EQ(seen, 1);
}

TEST_F(SerialPortOnCable, ALineThatBreaksClosesThePortAndALaterOpenReachesTheNewDevice) {
    std::vector<std::string> broken;
    auto b = port.Broken.subscribe([&](const std::string& why) { broken.push_back(why); });
    port.PortOpen(true);
    cable->cut("unplugged");
    EXPECT_EQ(broken, std::vector<std::string>{"unplugged"});
    EXPECT_FALSE(port.PortOpen());

    // Plugged in again: the next open finds the new line.
    MemorySerialCable replugged(loop);
    devices.plug("/dev/ttyS0", replugged.hostEnd());
    port.PortOpen(true);
    port.Output("again");
    EXPECT_EQ(replugged.hostSent(), "again");

    // A write on a cable cut under an open port fails with 8012 and closes the port.
    replugged.cut();
    port.PortOpen(true);  // the plugged end is the cut one: opening works, writing does not
    EXPECT_EQ(test::errorOf([&] { port.Output("x"); }), 8012);
    EXPECT_FALSE(port.PortOpen());
}

TEST(SerialPortDevices, ADeviceThatCannotBeOpenedIsNamedInTheErrorAndTheNextOpenTriesAgain) {
    VirtualEventLoop loop;
    SerialDevices devices(loop);
    std::string path = "/nonexistent/ttyUSB9";
    SerialPort port(devices, [&](int16_t) { return path; });
    try {
        port.PortOpen(true);
        FAIL() << "opened a missing device";
    } catch (const VbError& e) {
        EXPECT_EQ(e.number(), 8002);
        EXPECT_NE(e.description().find("/nonexistent/ttyUSB9"), std::string::npos);
        EXPECT_NE(e.description().find("No such file"), std::string::npos);
    }
    EXPECT_FALSE(port.PortOpen());
    path = "/dev/null";  // not a terminal
    EXPECT_EQ(test::errorOf([&] { port.PortOpen(true); }), 8002);

    // A line another program holds is refused as busy.
    PseudoTerminal pty(loop);
    const int other = ::open(pty.path().c_str(), O_RDWR | O_NOCTTY);
    ASSERT_GE(other, 0);
    ASSERT_EQ(::flock(other, LOCK_EX | LOCK_NB), 0);
    path = pty.path();
    try {
        port.PortOpen(true);
        FAIL() << "opened a device another program holds";
    } catch (const VbError& e) {
        EXPECT_EQ(e.number(), 8010);
        EXPECT_NE(e.description().find(pty.path()), std::string::npos);
    }
    ::close(other);
    port.PortOpen(true);
    EXPECT_TRUE(port.PortOpen());
}

TEST(SerialPortOnPseudoTerminal, EveryByteCrossesUnchangedInBothDirections) {
    PollEventLoop loop;
    SerialDevices devices(loop);
    PseudoTerminal pty(loop);
    std::string atDevice;
    pty.deviceEnd()->listen({[&](std::string_view b) { atDevice.append(b); }, {}});
    SerialPort port(devices, [&](int16_t) { return pty.path(); });
    port.Settings("19200,n,8,1");
    port.RThreshold(1);
    port.InputLen(1);
    std::string atHost;
    auto s = port.OnComm.subscribe([&] { atHost += port.Input(); });
    port.PortOpen(true);

    // Bytes a cooked line would change: CR, LF, XON/XOFF, ^C, ^D, DEL, 0xFF.
    std::string all;
    for (int b = 0; b < 256; ++b) all += static_cast<char>(b);
    port.Output(all);
    pty.deviceEnd()->write(all);
    for (int i = 0; i < 200 && (atDevice.size() < 256 || atHost.size() < 256); ++i)
        loop.runFor(milliseconds(5));
    EXPECT_EQ(atDevice, all);
    EXPECT_EQ(atHost, all);
}

}  // namespace
}  // namespace maroset::platform
