#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/EventLoop.h"
#include "platform/serial/SerialDevice.h"
#include "platform/serial/SerialSettings.h"

namespace maroset::platform {

// A serial device on a terminal descriptor: a real port (/dev/ttyS0, /dev/ttyUSB0) or either
// side of a pseudo-terminal. Owns the descriptor and closes it when destroyed.
//
// Open() puts the line in raw mode: no echo, no CR/LF translation, no XON/XOFF, no signal
// characters, no modem control, so every byte passes through unchanged; and takes an
// exclusive lock on the device, so two programs never share one line.
class TerminalDevice final : public SerialDevice {
  public:
    // Opens the terminal at path with the settings. Fails with 8002 when the device cannot be
    // opened (missing, no permission, not a terminal) and 8010 when another program holds it;
    // both descriptions name the device and the reason.
    static std::shared_ptr<TerminalDevice> Open(EventLoop& loop, const std::string& path,
                                                const SerialSettings& settings);
    // Takes over an open, non-blocking descriptor.
    TerminalDevice(EventLoop& loop, int fd, std::string name);
    ~TerminalDevice() override;
    TerminalDevice(const TerminalDevice&) = delete;
    TerminalDevice& operator=(const TerminalDevice&) = delete;

    void listen(Handlers handlers) override;
    void stopListening() override;
    void write(std::string_view bytes) override;
    std::string name() const override { return name_; }

    // Sets a terminal descriptor to raw mode with the settings (8002 when it is refused).
    static void MakeRaw(int fd, const SerialSettings& settings, const std::string& name);

  private:
    void onReady(short revents);
    void breakLine(const std::string& why);

    EventLoop& loop_;
    int fd_;
    std::string name_;
    Handlers handlers_;
    std::optional<EventLoop::WatchId> watch_;
    bool broken_ = false;
    // Lets a handler destroy this device while onReady is still on the stack.
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
