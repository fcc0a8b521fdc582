#pragma once

#include <filesystem>
#include <map>
#include <memory>
#include <string>

#include "core/ErrorTrap.h"
#include "core/LinkStatusBoard.h"
#include "core/ReportTap.h"
#include "platform/Clock.h"
#include "platform/EventLoop.h"
#include "platform/FileSystem.h"
#include "platform/LinkIncidents.h"
#include "platform/opc/OpcServerRegistry.h"
#include "platform/serial/SerialDevices.h"
#include "platform/tcp/TcpNetwork.h"

namespace maroset {

class nodeDB;
class ClsNodeDBInterface;

// The process-wide state of the system, in one place: the platform (loop, clock, drive C:,
// serial port map, Modbus port, message box), the error trap, the one nodeDB and the hidden
// façade that drivers report through.
//
// current() creates the runtime on first use, on the real platform. Tests install a fresh one
// for each test with ScopedRuntime, so no test sees another's nodes, counters or files.
class Runtime {
  public:
    using MessageBox = ErrorTrap::MessageBox;

    // The real platform: a poll loop, the system clock, the default drive root, message boxes
    // on standard error.
    Runtime();
    Runtime(std::unique_ptr<platform::EventLoop> loop, std::unique_ptr<platform::Clock> clock,
            std::filesystem::path driveRoot);
    ~Runtime();
    Runtime(const Runtime&) = delete;
    Runtime& operator=(const Runtime&) = delete;

    static Runtime& current();
    // Makes `runtime` current (nullptr: the next current() makes a default one); returns the
    // one that was current. Used by ScopedRuntime.
    static Runtime* exchange(Runtime* runtime);

    platform::EventLoop& loop() { return *loop_; }
    const platform::Clock& clock() const { return *clock_; }
    platform::FileSystem& files() { return files_; }
    ErrorTrap& trap() { return trap_; }

    // Shows a modal message (the default handler writes it to standard error).
    void MsgBox(const std::string& text);
    void setMessageBox(MessageBox handler);

    // The device of serial port N as the node `node` sees it: a mapping for that node and
    // port, else a mapping for the port, else "/dev/ttyS<N-1>". Node names match in any
    // letter case, as the node collection's keys do. A mapping for one node lets a host run
    // two serial drivers that both use port 1 on two adapters.
    std::string serialDevice(int port, const std::string& node = {}) const;
    // Maps port N to a device, for every node (node empty) or for one node.
    void mapSerialPort(int port, std::string device, const std::string& node = {});
    // Where serial ports open their devices (tests plug in-memory cables here).
    platform::SerialDevices& serialDevices() { return serialDevices_; }

    // Where TCP clients connect (tests plug in-memory servers here).
    platform::TcpNetwork& tcp() { return tcp_; }

    // The one stream of link incidents that drivers and port owners report to.
    platform::LinkIncidents& incidents() { return incidents_; }
    // Every value and error report, by node, for observers beside the host.
    ReportTap& reports() { return reports_; }
    // The link status of every started node, fed by the two above.
    LinkStatusBoard& linkStatus() { return linkStatus_; }

    // The TCP port used for a coupler's Modbus port 502 (502 unless mapped, for simulators
    // and tests that run without privileges).
    int modbusPort() const { return modbusPort_; }
    void setModbusPort(int port) { modbusPort_ = port; }

    // The OPC servers that OPCServer.Connect finds by program identifier (the built-in
    // simulated server; hosts and tests register others).
    platform::OpcServerRegistry& opcServers() { return opcServers_; }

    // The process-wide nodeDB and hidden façade, created on first use.
    std::shared_ptr<nodeDB> nodes();
    ClsNodeDBInterface& hiddenInterface();

  private:
    std::unique_ptr<platform::EventLoop> loop_;
    std::unique_ptr<platform::Clock> clock_;
    platform::FileSystem files_;
    MessageBox messageBox_;
    ErrorTrap trap_;
    platform::SerialDevices serialDevices_;
    platform::TcpNetwork tcp_;
    platform::LinkIncidents incidents_{*clock_};
    ReportTap reports_;
    LinkStatusBoard linkStatus_{incidents_, reports_, *clock_};
    // Keyed by upper-cased node name ("" for every node) and port.
    std::map<std::pair<std::string, int>, std::string> serialPorts_;
    int modbusPort_ = 502;
    platform::OpcServerRegistry opcServers_{*loop_, *clock_};
    // Last, so they go first: drivers still use the loop while they shut down.
    std::shared_ptr<nodeDB> nodeDB_;
    std::unique_ptr<ClsNodeDBInterface> hidden_;
};

}  // namespace maroset
