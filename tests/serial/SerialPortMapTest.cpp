#include "core/Runtime.h"

#include <gtest/gtest.h>

#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using SerialPortMap = test::RuntimeFixture;

TEST_F(SerialPortMap, ANodesOwnMappingWinsOverThePortsAndTheDefaultIsTtyS) {
    Runtime& rt = runtime();
    EXPECT_EQ(rt.serialDevice(1), "/dev/ttyS0");
    EXPECT_EQ(rt.serialDevice(3, "Plc"), "/dev/ttyS2");
    rt.mapSerialPort(1, "/dev/ttyUSB0");
    rt.mapSerialPort(1, "/dev/ttyUSB1", "Meter");
    EXPECT_EQ(rt.serialDevice(1), "/dev/ttyUSB0");
    EXPECT_EQ(rt.serialDevice(1, "Plc"), "/dev/ttyUSB0");
    EXPECT_EQ(rt.serialDevice(1, "METER"), "/dev/ttyUSB1") << "node names match in any case";
    EXPECT_EQ(rt.serialDevice(2, "Meter"), "/dev/ttyS1");
}

}  // namespace
}  // namespace maroset
