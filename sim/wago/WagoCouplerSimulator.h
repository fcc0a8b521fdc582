#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "sim/Simulator.h"

namespace maroset::sim {

// A WAGO Ethernet fieldbus coupler on Modbus/TCP, listening on 127.0.0.1.
//
// The coupler driver's MBT calls block until their reply is in, so this simulator cannot share
// the host's thread: it serves on a thread of its own, with libmodbus's server side. Every
// member may be called from any thread.
//
// Process image:
//   input words   256   function 04 at 0-255
//   output words  256   written by functions 06/16 at 0-255, read back by 03 at 512-767
//   input bits    512   function 02 at 0-511
//   output bits  4608   written by functions 05/15 at 0-4607, read back by 01: bits 0-4094
//                       at 512-4606, bits 4095-4607 at 8191-8703
// Any other address is answered with exception 02 (Illegal data address). Function 07 answers
// the exception status byte (0 unless set).
//
// With motion on, the inputs move once a period: input word 0 counts up, input word 1 swings
// between -300 and 300, input bits 0-15 show the bits of the count.
//
// Faults on demand: silence (requests are taken and never answered), late answers, garbled
// answers (a reply that does not fit its request), refused connections (no listener), dropped
// connections, and stop/start (switched off and on again, on the same port).
class WagoCouplerSimulator final : public Simulator {
  public:
    static constexpr int InputWords = 256;
    static constexpr int OutputWords = 256;
    static constexpr int InputBits = 512;
    static constexpr int OutputBits = 4608;

    struct Options {
        uint16_t port = 0;  // 0: a free port
        bool motion = true;
        std::chrono::milliseconds motionPeriod{1000};
    };
    // One request as it arrived: function, start address, count (1 for 05, 06; 0 for 07).
    struct Request {
        uint8_t function;
        uint16_t address;
        uint16_t count;
        friend bool operator==(const Request&, const Request&) = default;
    };

    // Starts serving; fails with std::runtime_error when the port cannot be had.
    explicit WagoCouplerSimulator(Options options);
    WagoCouplerSimulator() : WagoCouplerSimulator(Options{}) {}
    ~WagoCouplerSimulator() override;
    WagoCouplerSimulator(const WagoCouplerSimulator&) = delete;
    WagoCouplerSimulator& operator=(const WagoCouplerSimulator&) = delete;

    // Switched off: the listener and every connection are closed when stop() returns. start()
    // serves again on the same port, with the process image as it was.
    void stop();
    void start();
    bool running() const;

    uint16_t port() const;
    std::string endpoint() const override;
    std::string help() const override;
    std::string command(std::string_view line) override;

    // The process image. Indexes outside the image fail with std::out_of_range.
    void setInputWord(int index, int16_t value);
    void setInputBit(int index, bool value);
    int16_t inputWord(int index) const;
    bool inputBit(int index) const;
    void setOutputWord(int index, int16_t value);
    void setOutputBit(int index, bool value);
    int16_t outputWord(int index) const;
    bool outputBit(int index) const;
    void setExceptionStatus(uint8_t status);
    void setMotion(bool on);

    // Faults. Each is in force when the call returns.
    void setSilent(bool on);
    void setReplyDelay(std::chrono::milliseconds delay);
    void setGarbled(bool on);
    void setRefusing(bool on);
    void dropConnections();

    // What it saw: the requests in arrival order (the last 4096), connections accepted so far
    // and open now.
    std::vector<Request> requests() const;
    void clearRequests();
    size_t connectionsAccepted() const;
    size_t openConnections() const;

  private:
    struct Server;

    // Runs `change` under the lock and waits until the server thread has acted on it.
    template <class Change>
    void control(Change&& change);

    std::unique_ptr<Server> server_;
};

}  // namespace maroset::sim
