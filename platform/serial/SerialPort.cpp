#include "platform/serial/SerialPort.h"

#include "lang/VbError.h"
#include "platform/serial/SerialErrors.h"

namespace maroset::platform {

SerialPort::SerialPort(SerialDevices& devices, DevicePath devicePath)
    : devices_(devices), devicePath_(std::move(devicePath)) {}

SerialPort::~SerialPort() {
    *alive_ = false;
    if (device_) device_->stopListening();
}

void SerialPort::CommPort(int16_t port) {
    if (device_) throw VbError(err::CommPortAlreadyOpen, "Port already open");
    if (port < 1) throw VbError(err::CommInvalidPort, "Invalid port number");
    commPort_ = port;
}

void SerialPort::Settings(const std::string& text) {
    settings_ = SerialSettings::Parse(text);
    settingsText_ = text;
}

void SerialPort::PortOpen(bool open) {
    if (open == PortOpen()) return;
    if (!open) {
        device_->stopListening();
        device_.reset();
        return;
    }
    const std::string path = devicePath_(commPort_);
    std::shared_ptr<SerialDevice> device = devices_.open(path, settings_);
    input_.clear();
    inputStart_ = 0;
    device->listen({[this](std::string_view bytes) { received(bytes); },
                    [this](const std::string& why) { lineBroke(why); }});
    device_ = std::move(device);
}

std::string SerialPort::Input() {
    const size_t available = input_.size() - inputStart_;
    const size_t n = inputLen_ > 0 ? std::min<size_t>(size_t(inputLen_), available) : available;
    std::string out = input_.substr(inputStart_, n);
    inputStart_ += n;
    if (inputStart_ == input_.size()) {
        input_.clear();
        inputStart_ = 0;
    }
    return out;
}

bool SerialPort::Output(std::string_view bytes) {
    if (!device_) throw VbError(err::CommPortNotOpen, "Operation valid only when the port is open");
    try {
        return device_->write(bytes);
    } catch (const VbError&) {
        // The line is gone: the next open reaches the device anew.
        PortOpen(false);
        throw;
    }
}

void SerialPort::received(std::string_view bytes) {
    input_.append(bytes);
    if (rThreshold_ <= 0) return;
    const std::shared_ptr<bool> alive = alive_;
    // One receive event per byte, as the port owners read one byte per event.
    for (size_t i = 0; i < bytes.size(); ++i) {
        OnComm.raise();
        if (!*alive || !device_) return;
    }
}

void SerialPort::lineBroke(const std::string& why) {
    device_.reset();
    Broken.raise(why);
}

}  // namespace maroset::platform
