#pragma once

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "cli/CommandLine.h"
#include "core/TracePrinter.h"

namespace maroset::cli {

// How `maroset run` and `maroset serve` set up the runtime before they load the project.
struct HostOptions {
    struct SerialMapping {
        std::string node;  // empty: every node
        int32_t port;
        std::string device;
    };
    std::string project;
    std::optional<std::filesystem::path> driveRoot;
    std::vector<SerialMapping> serialPorts;  // --com [NODE:]N=DEVICE
    std::optional<int32_t> modbusPort;
    bool trap = false;
    bool trace = false;
    bool json = false;

    // --drive-root, --com, --modbus-port, --trap, --trace.
    static std::vector<CommandLine::Option> Declared();
    // Reads them from a parsed command line (UsageError when one is malformed).
    void read(const CommandLine& cl);
    // Sets up the current runtime: drive root, serial ports, Modbus port, trap; with --trace,
    // starts printer writing the link incidents to standard error, for as long as it lives.
    void apply(std::optional<TracePrinter>& printer) const;
    // The project's file as a native path (a path on drive C: mapped to the drive root).
    std::filesystem::path projectFile() const;
    // Whether the project file is there (a path on drive C: that the load will judge counts).
    bool projectExists() const;
};

}  // namespace maroset::cli
