#pragma once

#include <map>
#include <memory>
#include <string>

#include "platform/EventLoop.h"
#include "platform/serial/SerialDevice.h"
#include "platform/serial/SerialSettings.h"

namespace maroset::platform {

// Where serial ports find their devices: by path, a device plugged in here (an in-memory
// cable's end, in tests), otherwise the terminal at that path, opened afresh each time.
class SerialDevices {
  public:
    explicit SerialDevices(EventLoop& loop) : loop_(loop) {}

    // Opens the device at path, set to settings. Errors as TerminalDevice::Open gives them.
    std::shared_ptr<SerialDevice> open(const std::string& path, const SerialSettings& settings);

    // From now on, path opens this device (settings do not apply to it).
    void plug(const std::string& path, std::shared_ptr<SerialDevice> device);
    void unplug(const std::string& path);

  private:
    EventLoop& loop_;
    std::map<std::string, std::shared_ptr<SerialDevice>> plugged_;
};

}  // namespace maroset::platform
