#include "platform/serial/SerialDevices.h"

#include "platform/serial/TerminalDevice.h"

namespace maroset::platform {

std::shared_ptr<SerialDevice> SerialDevices::open(const std::string& path,
                                                  const SerialSettings& settings) {
    if (auto it = plugged_.find(path); it != plugged_.end()) return it->second;
    return TerminalDevice::Open(loop_, path, settings);
}

void SerialDevices::plug(const std::string& path, std::shared_ptr<SerialDevice> device) {
    plugged_[path] = std::move(device);
}

void SerialDevices::unplug(const std::string& path) {
    plugged_.erase(path);
}

}  // namespace maroset::platform
