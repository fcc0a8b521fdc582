#pragma once

#include <pybind11/pybind11.h>

#include <cstdint>
#include <string>

namespace maroset::python {

// `maroset.runtime`: the settings of the process-wide runtime a host makes before it loads a
// project (the `maroset run` options): drive C:, serial ports, the Modbus port, the trap
// switch and the message box.
class RuntimeSettings {
  public:
    // `runtime.com_ports`: ports[N] or ports[node, N] reads and maps the device of port N.
    struct SerialPorts {};

    std::string driveRoot() const;
    void setDriveRoot(pybind11::handle path);

    // The device of serial port N, for every node or for one node: key N or (node, N).
    std::string serialDevice(pybind11::handle key) const;
    void mapSerialPort(pybind11::handle key, const std::string& device);
    // Maps every entry of a dict {N or (node, N): device}.
    void mapSerialPorts(const pybind11::dict& ports);

    int32_t modbusPort() const;
    void setModbusPort(int32_t port);

    bool trap() const;
    void setTrap(bool on);

    // The callable that shows message boxes (text -> None); None restores the default, which
    // writes to standard error.
    pybind11::object messageBox() const;
    void setMessageBox(pybind11::object handler);
};

}  // namespace maroset::python
