#include "RuntimeSettings.h"

#include <utility>

#include "VariantConversion.h"
#include "core/Runtime.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

// Kept for the life of the process, as the runtime that calls it.
py::object& messageBox_() {
    static auto* handler = new py::object(py::none());
    return *handler;
}

std::pair<std::string, int> PortKey(py::handle key) {
    std::string node;
    py::handle port = key;
    if (py::isinstance<py::tuple>(key) && py::len(key) == 2) {
        const auto pair = py::reinterpret_borrow<py::tuple>(key);
        node = TextFromPython(py::str(pair[0]));
        port = pair[1];
    }
    if (!py::isinstance<py::int_>(port))
        throw py::key_error("a serial port is N or (node, N), N a whole number");
    return {node, py::cast<int>(port)};
}

}  // namespace

std::string RuntimeSettings::driveRoot() const {
    return Runtime::current().files().driveRoot().string();
}

void RuntimeSettings::setDriveRoot(py::handle path) {
    Runtime::current().files().setDriveRoot(PathFromPython(path));
}

std::string RuntimeSettings::serialDevice(py::handle key) const {
    const auto [node, port] = PortKey(key);
    return Runtime::current().serialDevice(port, node);
}

void RuntimeSettings::mapSerialPort(py::handle key, const std::string& device) {
    const auto [node, port] = PortKey(key);
    if (port < 1) throw py::value_error("serial ports are numbered from 1");
    Runtime::current().mapSerialPort(port, device, node);
}

void RuntimeSettings::mapSerialPorts(const py::dict& ports) {
    for (const auto& [key, device] : ports) mapSerialPort(key, TextFromPython(py::str(device)));
}

int32_t RuntimeSettings::modbusPort() const {
    return Runtime::current().modbusPort();
}

void RuntimeSettings::setModbusPort(int32_t port) {
    if (port < 1 || port > 65535) throw py::value_error("a TCP port is 1 to 65535");
    Runtime::current().setModbusPort(port);
}

bool RuntimeSettings::trap() const {
    return Runtime::current().trap().enabled();
}

void RuntimeSettings::setTrap(bool on) {
    Runtime::current().trap().setEnabled(on);
}

py::object RuntimeSettings::messageBox() const {
    return messageBox_();
}

void RuntimeSettings::setMessageBox(py::object handler) {
    if (!handler.is_none() && !PyCallable_Check(handler.ptr()))
        throw py::type_error("message_box takes a callable or None");
    messageBox_() = std::move(handler);
    // None shows the text on Python's standard error, where a Python host looks for it.
    Runtime::current().setMessageBox([](const std::string& text) {
        const py::object handler = messageBox_();
        try {
            if (handler.is_none())
                py::module_::import("sys").attr("stderr").attr("write")(TextToPython(text + "\n"));
            else
                handler(TextToPython(text));
        } catch (py::error_already_set& e) {
            e.discard_as_unraisable(handler);
        }
    });
}

}  // namespace maroset::python
