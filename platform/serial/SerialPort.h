#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "lang/Event.h"
#include "platform/serial/SerialDevice.h"
#include "platform/serial/SerialDevices.h"
#include "platform/serial/SerialSettings.h"

namespace maroset::platform {

// The serial port control the system's port owners hold: a port number, a settings text, an
// open flag, an input buffer with a receive event, and output.
//
// - CommPort N is the device devicePath(N) gives (the runtime's port map); it cannot change
//   while the port is open (8005).
// - Settings ("9600,n,8,1" at first) are checked when set (380) and applied when the port
//   opens.
// - PortOpen(true) opens the device; a device that cannot be opened fails with 8002 or 8010,
//   naming the device, and the port stays closed, so a later open tries again.
// - While RThreshold > 0, OnComm is raised once for every byte that arrives, after the byte
//   is in the input buffer. Input() takes up to InputLen bytes from the buffer (all of them
//   when InputLen is 0).
// - Output() writes bytes without waiting: what the device does not take at once is queued
//   (bounded) and goes out as the device takes it, the port staying open. It answers false,
//   sending nothing, when the device stopped taking output and its queue is full; the owner
//   treats that as a request that got no reply. On a closed port it fails with 8018; when the
//   line broke it fails with 8012 and the port is closed.
// - When the device goes away (adapter unplugged), the port closes itself and raises Broken
//   with the reason. Opening it again later reaches the device anew.
//
// Handlers of OnComm and Broken may close the port or destroy it.
class SerialPort {
  public:
    using DevicePath = std::function<std::string(int16_t port)>;

    SerialPort(SerialDevices& devices, DevicePath devicePath);
    ~SerialPort();
    SerialPort(const SerialPort&) = delete;
    SerialPort& operator=(const SerialPort&) = delete;

    int16_t CommPort() const { return commPort_; }
    void CommPort(int16_t port);
    const std::string& Settings() const { return settingsText_; }
    void Settings(const std::string& text);
    bool PortOpen() const { return static_cast<bool>(device_); }
    void PortOpen(bool open);
    int16_t RThreshold() const { return rThreshold_; }
    void RThreshold(int16_t bytes) { rThreshold_ = bytes; }
    int16_t InputLen() const { return inputLen_; }
    void InputLen(int16_t bytes) { inputLen_ = bytes; }
    int32_t InBufferCount() const { return static_cast<int32_t>(input_.size()); }
    std::string Input();
    bool Output(std::string_view bytes);

    // The device of the current port number.
    std::string DeviceName() const { return devicePath_(commPort_); }

    Event<> OnComm;
    Event<const std::string&> Broken;

  private:
    void received(std::string_view bytes);
    void lineBroke(const std::string& why);

    SerialDevices& devices_;
    DevicePath devicePath_;
    int16_t commPort_ = 1;
    std::string settingsText_ = "9600,n,8,1";
    SerialSettings settings_;
    int16_t rThreshold_ = 0;
    int16_t inputLen_ = 0;
    std::string input_;
    size_t inputStart_ = 0;
    std::shared_ptr<SerialDevice> device_;
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
