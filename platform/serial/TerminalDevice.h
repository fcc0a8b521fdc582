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
// Output never blocks the loop: bytes the terminal does not take at once (flow control held,
// a converter that stopped, a pseudo-terminal nobody reads) wait in a queue of at most
// OutputLimit bytes, drained while the descriptor is writable; a write that does not fit is
// refused whole, so a frame never goes out in part.
//
// Open() puts the line in raw mode: no echo, no CR/LF translation, no XON/XOFF, no signal
// characters, no modem control, so every byte passes through unchanged; and takes an
// exclusive lock on the device, so two programs never share one line.
class TerminalDevice final : public SerialDevice {
  public:
    // A few of the longest frames any serial family sends.
    static constexpr size_t OutputLimit = 4096;

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
    bool write(std::string_view bytes) override;
    // Bytes waiting for the terminal to take them.
    size_t queued() const { return output_.size(); }
    std::string name() const override { return name_; }

    // Sets a terminal descriptor to raw mode with the settings (8002 when it is refused).
    static void MakeRaw(int fd, const SerialSettings& settings, const std::string& name);

  private:
    void onReady(short revents);
    void breakLine(const std::string& why);
    // Writes what the terminal takes now; fails when the line is broken.
    size_t writeSome(std::string_view bytes);
    void drain();

    EventLoop& loop_;
    int fd_;
    std::string name_;
    Handlers handlers_;
    std::optional<EventLoop::WatchId> watch_;
    std::string output_;
    std::optional<EventLoop::WatchId> outputWatch_;
    bool broken_ = false;
    // Lets a handler destroy this device while onReady is still on the stack.
    std::shared_ptr<bool> alive_ = std::make_shared<bool>(true);
};

}  // namespace maroset::platform
