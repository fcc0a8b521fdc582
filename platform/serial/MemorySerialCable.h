#pragma once

#include <memory>
#include <string>

#include "platform/EventLoop.h"
#include "platform/serial/SerialDevice.h"

namespace maroset::platform {

// A serial cable in memory, for tests on the virtual clock: two ends, the host's (what the
// system's serial port opens) and the device's (what a simulator or a test speaks through).
// Bytes written at one end arrive at the other at the next turn of the loop, in one chunk per
// write; an end that is not listening then drops them, as a closed port would. The cable also
// records everything each end wrote, so a test can check the bytes on the wire.
//
// cut() breaks the line: both ends report broken and writes fail, as an unplugged adapter does.
// The ends may outlive the cable object; they then deliver nothing.
class MemorySerialCable {
  public:
    explicit MemorySerialCable(EventLoop& loop, std::string name = "memory cable");
    ~MemorySerialCable();
    MemorySerialCable(const MemorySerialCable&) = delete;
    MemorySerialCable& operator=(const MemorySerialCable&) = delete;

    std::shared_ptr<SerialDevice> hostEnd() const;
    std::shared_ptr<SerialDevice> deviceEnd() const;

    // Every byte the host end wrote since the last take (or since the start).
    const std::string& hostSent() const;
    std::string takeHostSent();
    // Every byte the device end wrote since the last take.
    const std::string& deviceSent() const;
    std::string takeDeviceSent();

    void cut(const std::string& why = "cable cut");

  private:
    struct Line;
    class End;
    std::shared_ptr<Line> line_;
};

}  // namespace maroset::platform
