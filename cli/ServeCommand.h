#pragma once

#include <string>
#include <vector>

#include "gateway/WebService.h"

namespace maroset::cli {

// `maroset serve`: a project as a service. Loads the project (AddAllNodes), registers the
// tags of its Tags table, starts scanning, and serves the HTTP API and page on the same loop
// until SIGINT or SIGTERM, which stop scanning and remove the nodes before it exits 0.
class ServeCommand {
  public:
    static const char* const Usage;
    // `maroset serve ARGS...`; returns the exit status: 0 stopped by a signal, 1 the project
    // or the listen address failed, 2 usage error.
    static int Main(const std::vector<std::string>& args);

    // "ADDR:PORT" into settings' host and port (UsageError when it is not an IPv4 address and
    // a port from 0 to 65535).
    static void ParseListen(const std::string& text, gateway::WebService::Settings& settings);
};

}  // namespace maroset::cli
