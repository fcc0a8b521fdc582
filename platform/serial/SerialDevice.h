#pragma once

#include <functional>
#include <string>
#include <string_view>

namespace maroset::platform {

// A byte stream to one serial device: a terminal (a real port, or either side of a
// pseudo-terminal) or one end of an in-memory cable. What the serial port control reads
// and writes, and what a simulator speaks through.
//
// Handlers run on the runtime's loop, never inside write(). A handler may stop listening or
// destroy the device. After `broken` the device delivers nothing more and writes fail.
//
// write() never waits: what the device does not take at once waits in a bounded output queue
// that the loop drains as the device takes it.
class SerialDevice {
  public:
    struct Handlers {
        // Bytes as they arrived, in order (any chunking).
        std::function<void(std::string_view bytes)> received;
        // The line went away (adapter unplugged, the other side closed), with the reason.
        std::function<void(const std::string& why)> broken;
    };

    virtual ~SerialDevice() = default;

    // Starts delivering to handlers, replacing earlier ones.
    virtual void listen(Handlers handlers) = 0;
    // Stops delivering; bytes that arrive meanwhile are dropped.
    virtual void stopListening() = 0;
    // Writes every byte or queues what the device does not take yet, and answers true; answers
    // false, writing nothing, when the queue has no room for them (a device that stopped
    // reading). Fails with a run-time error whose description names the device when the line
    // is broken.
    virtual bool write(std::string_view bytes) = 0;
    // The device, for messages ("/dev/ttyUSB0").
    virtual std::string name() const = 0;
};

}  // namespace maroset::platform
