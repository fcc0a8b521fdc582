#include "cli/HostOptions.h"

#include <iostream>

#include "cli/UsageError.h"
#include "core/Runtime.h"
#include "lang/VbError.h"

namespace maroset::cli {

std::vector<CommandLine::Option> HostOptions::Declared() {
    return {{"drive-root", true}, {"com", true, true}, {"modbus-port", true}, {"trap"}, {"trace"}};
}

void HostOptions::read(const CommandLine& cl) {
    if (auto root = cl.value("drive-root")) {
        if (root->empty()) throw UsageError("option '--drive-root' needs a directory");
        driveRoot = std::filesystem::absolute(*root);
    }
    for (const auto& com : cl.values("com")) {
        const auto eq = com.find('=');
        const std::string left = com.substr(0, eq);
        const auto colon = left.rfind(':');
        const std::string node = colon == std::string::npos ? "" : left.substr(0, colon);
        const auto port = eq == std::string::npos
                              ? std::nullopt
                              : CommandLine::ParseInteger(left.substr(colon + 1));
        if (!port || *port < 1 || *port > 255 || eq + 1 >= com.size() ||
            (colon != std::string::npos && node.empty()))
            throw UsageError(
                "option '--com' needs N=DEVICE or NODE:N=DEVICE with N from 1 to "
                "255, not '" +
                com + "'");
        serialPorts.push_back({node, *port, com.substr(eq + 1)});
    }
    modbusPort = cl.integer("modbus-port", 1, 65535);
    trap = cl.has("trap");
    trace = cl.has("trace");
}

void HostOptions::apply(std::optional<TracePrinter>& printer) const {
    Runtime& rt = Runtime::current();
    if (driveRoot) rt.files().setDriveRoot(*driveRoot);
    for (const auto& m : serialPorts) rt.mapSerialPort(m.port, m.device, m.node);
    if (modbusPort) rt.setModbusPort(*modbusPort);
    if (trap) rt.trap().setEnabled(true);
    if (trace) {
        // Standard error, flushed per line: events and replies on standard output stay as
        // they are, and a user watching a line sees each incident as it happens.
        printer.emplace(rt.incidents(),
                        [](std::string_view line) { std::cerr << "trace " << line << std::endl; });
    }
}

std::filesystem::path HostOptions::projectFile() const {
    // The library takes a path with a drive letter or a backslash as a path on drive C:.
    const bool drivePath =
        (project.size() >= 2 && project[1] == ':') || project.find('\\') != std::string::npos;
    return drivePath ? Runtime::current().files().resolve(project) : std::filesystem::path(project);
}

bool HostOptions::projectExists() const {
    std::filesystem::path file;
    try {
        file = projectFile();
    } catch (const VbError&) {
        return true;  // the load reports what is wrong with the path
    }
    std::error_code ec;
    return std::filesystem::exists(file, ec);
}

}  // namespace maroset::cli
