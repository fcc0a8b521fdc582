#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "core/LinkStatus.h"
#include "lang/Variant.h"

namespace maroset::cli {

// The answer to one command of `maroset run`: its name (the command word), success or the
// run-time error it ended with, and what the command reports besides (the node list, the
// link status).
struct Reply {
    struct NodeEntry {
        std::string name;
        Variant driver;  // as the Driver column (or addnode) gave it
    };

    explicit Reply(std::string name) : command(std::move(name)) {}

    std::string command;
    bool ok = true;
    int32_t number = 0;
    std::string description;
    // Why a command line was refused; shown in readable output only.
    std::string detail;
    std::optional<std::vector<NodeEntry>> nodes;
    std::optional<std::vector<LinkStatus>> status;
    // The node the command is about; an error reply names it.
    std::string node;

    void fail(int32_t errorNumber, std::string errorDescription, std::string why = {}) {
        if (!ok) return;  // the first error is the one reported
        ok = false;
        number = errorNumber;
        description = std::move(errorDescription);
        detail = std::move(why);
        nodes.reset();
        status.reset();
    }
};

}  // namespace maroset::cli
