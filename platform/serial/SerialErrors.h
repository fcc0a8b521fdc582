#pragma once

#include <cstdint>

namespace maroset::platform::err {

// Error numbers of the serial port control, for failures hosts and logs should recognise.
inline constexpr int32_t CommInvalidPort = 8002;      // the device cannot be opened
inline constexpr int32_t CommPortAlreadyOpen = 8005;  // CommPort changed while open
inline constexpr int32_t CommHardwareInUse = 8010;    // another program holds the device
inline constexpr int32_t CommDeviceNotOpen = 8012;    // the line broke under a write
inline constexpr int32_t CommPortNotOpen = 8018;      // output on a closed port

}  // namespace maroset::platform::err
