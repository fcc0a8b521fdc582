#pragma once

#include <memory>
#include <string>
#include <vector>

#include "cli/CommandLine.h"
#include "sim/Simulator.h"

namespace maroset::cli {

// `maroset sim KIND [options]`: runs one device simulator on its own until Ctrl-C, for a user
// commissioning a host or a line without the device. It prints where the simulator listens
// and how to point `maroset run` at it, then reads operator commands (faults, data) from
// standard input, one per line, and prints each answer. End of input leaves it serving.
class SimCommand {
  public:
    struct Kind {
        const char* name;     // "df1"
        const char* summary;  // one line, for the list of kinds
        const char* usage;    // the help of `maroset sim NAME`
        std::vector<CommandLine::Option> options;
        // Starts the simulator on the current runtime's loop, with values that change over
        // time so that a host sees them move.
        std::unique_ptr<sim::Simulator> (*start)(const CommandLine& options);
        // How to connect a host: "{}" stands for the simulator's endpoint, "{port}" for its TCP
        // port.
        const char* connect;
    };

    static const char* const Usage;
    // `maroset sim ARGS...`; returns the exit status.
    static int Main(const std::vector<std::string>& args);
    // Every kind, in the order the list shows them. A new simulator adds its row here.
    static const std::vector<Kind>& Kinds();

  private:
    static int Serve(const Kind& kind, const CommandLine& options);
};

}  // namespace maroset::cli
