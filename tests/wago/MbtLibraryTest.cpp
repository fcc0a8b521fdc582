#include "platform/mbt/MbtLibrary.h"

#include <gtest/gtest.h>

#include <array>
#include <filesystem>
#include <memory>
#include <thread>
#include <vector>

#include "support/ChildProcess.h"
#include "sim/wago/WagoCouplerSimulator.h"

namespace maroset::platform {
namespace {

using std::chrono::milliseconds;
using Bytes = std::vector<uint8_t>;

// A file next to this source. The build names sources relative to the build directory, the
// parent of the folder the test program is in.
std::filesystem::path besideThisFile(const char* name) {
    std::filesystem::path source(__FILE__);
    if (source.is_relative())
        source =
            std::filesystem::read_symlink("/proc/self/exe").parent_path().parent_path() / source;
    return source.parent_path() / name;
}

// The MBT functions against a Modbus/TCP server that is not ours (pymodbus, started from
// mbt_server.py beside this file), so that our client and our simulator cannot agree on a
// mistake. Its process image is described in the script.
class MbtAgainstPymodbus : public ::testing::Test {
  protected:
    static void SetUpTestSuite() {
        const std::filesystem::path script = besideThisFile("mbt_server.py");
        // Debian's interpreter, where python3-pymodbus installs.
        const char* python = "/usr/bin/python3";
        if (!std::filesystem::exists(python)) {
            problem_ = "no /usr/bin/python3: install python3 and python3-pymodbus (./run does)";
            return;
        }
        try {
            server_ = std::make_unique<test::ChildProcess>(
                std::vector<std::string>{python, script.string()});
        } catch (const std::exception& e) {
            problem_ = e.what();
            return;
        }
        const auto line = server_->readLine(milliseconds(15000));
        if (!line || line->rfind("PORT ", 0) != 0) {
            problem_ = "the pymodbus server did not start (its message is above)";
            server_.reset();
            return;
        }
        port_ = static_cast<uint16_t>(std::stoi(line->substr(5)));
    }
    static void TearDownTestSuite() { server_.reset(); }

    void SetUp() override {
        ASSERT_NE(port_, 0) << problem_;
        ASSERT_EQ(mbt.MBTInit(), mbt::Ok);
        ASSERT_EQ(mbt.MBTConnect("127.0.0.1", 502, 0, 100, handle), mbt::Ok) << mbt.LastErrorText();
    }

    Bytes readRegisters(uint8_t table, uint16_t start, uint16_t words, int32_t& status) {
        Bytes buffer(2u * words, 0xCC);
        status = mbt.MBTReadRegisters(handle, table, start, words, buffer);
        return buffer;
    }
    Bytes readCoils(uint8_t table, uint16_t start, uint16_t bits, int32_t& status) {
        Bytes buffer((bits + 7u) / 8u, 0xCC);
        status = mbt.MBTReadCoils(handle, table, start, bits, buffer);
        return buffer;
    }

    static inline std::unique_ptr<test::ChildProcess> server_;
    static inline uint16_t port_ = 0;
    static inline std::string problem_;

    // Port 502 goes to the server, as the runtime maps it for the coupler driver.
    MbtLibrary mbt{[](uint16_t port) -> uint16_t { return port == 502 ? port_ : port; }};
    MbtLibrary::Handle handle = 0;
};

TEST_F(MbtAgainstPymodbus, EachTableTypeReadsItsOwnTableWithWireOrderInTheBuffer) {
    int32_t status = -1;
    // Table 3: input registers (04); table 4: holding registers (03). High byte first.
    EXPECT_EQ(readRegisters(3, 0, 3, status), (Bytes{0x12, 0x34, 0xFF, 0xFF, 0x00, 0x07}));
    EXPECT_EQ(status, mbt::Ok);
    EXPECT_EQ(readRegisters(4, 0, 3, status), (Bytes{0xAB, 0xCD, 0x00, 0x02, 0x00, 0x03}));
    EXPECT_EQ(status, mbt::Ok);
    EXPECT_EQ(readRegisters(3, 5, 1, status), (Bytes{0x00, 105}));

    // A word read into this machine's 16-bit integer needs the swap to be the value.
    const Bytes w = readRegisters(3, 0, 1, status);
    const auto asStored = static_cast<uint16_t>(w[0] | (w[1] << 8));
    EXPECT_EQ(MbtLibrary::MBTSwapWord(asStored), 0x1234);

    // Table 1: discrete inputs (02), on at n % 3 == 0; table 0: coils (01), on at odd n. Bits
    // packed from bit 0 of the first byte, the rest of the last byte 0.
    EXPECT_EQ(readCoils(1, 0, 10, status), (Bytes{0b01001001, 0b00000010}));
    EXPECT_EQ(status, mbt::Ok);
    EXPECT_EQ(readCoils(0, 0, 10, status), (Bytes{0b10101010, 0b00000010}));
    EXPECT_EQ(status, mbt::Ok);
    EXPECT_EQ(readCoils(0, 7, 1, status), (Bytes{0x01}));
    EXPECT_EQ(readCoils(1, 7, 1, status), (Bytes{0x00}));

    // Function 07, sent raw: pymodbus's counters are all 0.
    uint8_t exceptionStatus = 0xCC;
    EXPECT_EQ(mbt.MBTReadExceptionStatus(handle, exceptionStatus), mbt::Ok) << mbt.LastErrorText();
    EXPECT_EQ(exceptionStatus, 0);
    EXPECT_EQ(readRegisters(3, 2, 1, status), (Bytes{0x00, 0x07}));
}

TEST_F(MbtAgainstPymodbus, WritesReachHoldingRegistersAndCoilsFromWireOrderBuffers) {
    ASSERT_EQ(mbt.MBTWriteRegisters(handle, 10, 2, Bytes{0x12, 0x34, 0xFF, 0xFE}), mbt::Ok);
    int32_t status = -1;
    EXPECT_EQ(readRegisters(4, 10, 2, status), (Bytes{0x12, 0x34, 0xFF, 0xFE}));

    ASSERT_EQ(mbt.MBTWriteCoils(handle, 20, 3, Bytes{0b101}), mbt::Ok);
    EXPECT_EQ(readCoils(0, 20, 3, status), (Bytes{0b101}));
    ASSERT_EQ(mbt.MBTWriteCoils(handle, 20, 3, Bytes{0b010}), mbt::Ok);
    EXPECT_EQ(readCoils(0, 20, 3, status), (Bytes{0b010}));
}

TEST_F(MbtAgainstPymodbus, ExceptionRepliesGiveTheirCodeAndKeepTheLink) {
    int32_t status = -1;
    readRegisters(3, 99, 2, status);
    EXPECT_EQ(status, mbt::IllegalDataAddress);
    EXPECT_EQ(mbt::StatusText(status), "Illegal data address");
    readCoils(0, 100, 1, status);
    EXPECT_EQ(status, mbt::IllegalDataAddress);
    EXPECT_EQ(readRegisters(3, 0, 1, status), (Bytes{0x12, 0x34}));
    EXPECT_EQ(status, mbt::Ok);
}

TEST_F(MbtAgainstPymodbus, AReplyLaterThanTheTimeOutIsNeverTakenForTheNextOne) {
    // Holding register 50 answers after 300 ms, well past the 100 ms time-out.
    int32_t status = -1;
    readRegisters(4, 50, 1, status);
    EXPECT_EQ(status, mbt::Timeout);
    EXPECT_EQ(mbt.LastErrorText(), "Connection timed out");
    // The connection is closed, so the late reply cannot answer this one.
    std::this_thread::sleep_for(milliseconds(400));
    readRegisters(4, 0, 1, status);
    EXPECT_EQ(status, mbt::ConnectionClosed);

    EXPECT_EQ(mbt.MBTDisconnect(handle), mbt::Ok);
    ASSERT_EQ(mbt.MBTConnect("127.0.0.1", 502, 0, 100, handle), mbt::Ok);
    EXPECT_EQ(readRegisters(4, 0, 1, status), (Bytes{0xAB, 0xCD}));
    EXPECT_EQ(status, mbt::Ok);
}

TEST_F(MbtAgainstPymodbus, HandlesLiveUntilDisconnectedAndCallsCheckTheirArguments) {
    Bytes two(2), big(300);
    EXPECT_EQ(mbt.OpenConnections(), 1u);
    // Table types of the other call, counts past the Modbus limits, short buffers, callbacks.
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 0, 0, 1, two), mbt::InvalidArgument);
    EXPECT_EQ(mbt.MBTReadCoils(handle, 3, 0, 1, two), mbt::InvalidArgument);
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 3, 0, 126, big), mbt::InvalidArgument);
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 3, 0, 2, two), mbt::InvalidArgument);
    EXPECT_EQ(mbt.MBTWriteCoils(handle, 0, 0, two), mbt::InvalidArgument);
    const MbtLibrary::MBTReadCompleted callback = [](MbtLibrary::Handle, uint32_t, int32_t, uint8_t,
                                                     uint16_t, uint16_t, uint16_t,
                                                     const uint8_t*) {};
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 3, 0, 1, two, callback, 7), mbt::NotSupported);
    // None of these touched the link.
    int32_t status = -1;
    EXPECT_EQ(readRegisters(3, 0, 1, status), (Bytes{0x12, 0x34}));

    EXPECT_EQ(mbt.MBTDisconnect(handle), mbt::Ok);
    EXPECT_EQ(mbt.OpenConnections(), 0u);
    EXPECT_EQ(mbt.MBTDisconnect(handle), mbt::InvalidHandle);
    EXPECT_EQ(mbt.MBTReadRegisters(handle, 3, 0, 1, two), mbt::InvalidHandle);
    EXPECT_EQ(mbt.MBTReadRegisters(0, 3, 0, 1, two), mbt::InvalidHandle);
}

// Failures of the connect itself, against a coupler that refuses connections.
class MbtConnect : public ::testing::Test {
  protected:
    MbtConnect() { refusing.setRefusing(true); }

    sim::WagoCouplerSimulator refusing{{.port = 0, .motion = false}};
    uint16_t port = refusing.port();
    MbtLibrary mbt;
    MbtLibrary::Handle handle = 99;
};

TEST_F(MbtConnect, RefusesWhatItCannotConnectAndSaysWhy) {
    EXPECT_EQ(mbt.MBTConnect("127.0.0.1", port, 0, 100, handle), mbt::NotInitialised);
    EXPECT_EQ(handle, 0);
    EXPECT_EQ(mbt.MBTExit(), mbt::NotInitialised);
    ASSERT_EQ(mbt.MBTInit(), mbt::Ok);

    handle = 99;
    EXPECT_EQ(mbt.MBTConnect("127.0.0.1", port, 0, 100, handle), mbt::ConnectFailed);
    EXPECT_EQ(handle, 0);
    EXPECT_EQ(mbt.LastErrorText(), "Connection refused");
    // Names need a resolver without a time bound: addresses only. UDP is not offered.
    for (const char* host : {"", "coupler.local", "127.0.0.256", "::1"})
        EXPECT_EQ(mbt.MBTConnect(host, port, 0, 100, handle), mbt::InvalidArgument) << host;
    EXPECT_EQ(mbt.MBTConnect("127.0.0.1", port, 0, 0, handle), mbt::InvalidArgument);
    EXPECT_EQ(mbt.MBTConnect("127.0.0.1", port, 1, 100, handle), mbt::NotSupported);
    EXPECT_EQ(mbt.OpenConnections(), 0u);
    EXPECT_EQ(mbt.MBTExit(), mbt::Ok);
}

TEST_F(MbtConnect, AnUnansweredConnectGivesUpAtTheTimeOut) {
    ASSERT_EQ(mbt.MBTInit(), mbt::Ok);
    // TEST-NET-1 is never routed: the connect is either dropped or refused at once.
    const auto started = std::chrono::steady_clock::now();
    EXPECT_EQ(mbt.MBTConnect("192.0.2.1", 502, 0, 100, handle), mbt::ConnectFailed);
    EXPECT_LT(std::chrono::steady_clock::now() - started, milliseconds(1000));
    EXPECT_EQ(handle, 0);
}

}  // namespace
}  // namespace maroset::platform
