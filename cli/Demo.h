#pragma once

#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "cli/DemoStation.h"
#include "gateway/WebService.h"

namespace maroset::cli {

// `maroset demo`: a small project with one node per driver the system has (each a
// DemoStation), run live for a few seconds in a temporary drive root that is removed at the
// end. Every value change and driver error is shown as it happens, as `maroset run` shows
// them. Needs no privileges. Ctrl-C stops it early, cleanly.
//
// Readable output goes to standard output; with --json the events are JSON lines on standard
// output and the narration (what it does, how it ended) goes to standard error.
class Demo {
  public:
    static const char* const Usage;
    // `maroset demo ARGS...`; returns the exit status.
    static int Main(const std::vector<std::string>& args);

    // The stations of the demo, in the order their nodes are added.
    static std::vector<std::unique_ptr<DemoStation>> Stations();

    Demo(int32_t seconds, bool json, std::ostream& out, std::ostream& narration);
    // Serves the demo's page and API while it runs (writes allowed on loopback).
    void serve(const gateway::WebService::Settings& web) { web_ = web; }
    int run();

  private:
    void runProject(const std::filesystem::path& root);

    int32_t seconds_;
    bool json_;
    std::ostream& out_;
    std::ostream& narration_;
    std::vector<std::unique_ptr<DemoStation>> stations_;
    std::optional<gateway::WebService::Settings> web_;
};

}  // namespace maroset::cli
