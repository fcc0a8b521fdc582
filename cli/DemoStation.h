#pragma once

#include <cstdint>
#include <filesystem>
#include <initializer_list>
#include <memory>
#include <string>
#include <vector>

#include "gateway/TagTable.h"

namespace maroset {
class node;
class nodeDB;
}  // namespace maroset

namespace maroset::cli {

class EventPrinter;

// One driver's part of `maroset demo`: its node in the demo project, the simulator the node
// talks to, the tags it registers and the values it changes while the demo runs. A new driver
// joins the demo with one more station (see Demo::Stations); give each station its own range
// of handles (memory tags 1-9, disk tags 11-19, the next 21-29, ...).
class DemoStation {
  public:
    virtual ~DemoStation() = default;

    // What it shows, for the demo's first line ("memory tags").
    virtual std::string title() const = 0;
    // Adds its node(s) to the demo project (ProjectDatabase::AddNode).
    virtual void addNodes(const std::filesystem::path& project) = 0;
    // Starts the simulator its node talks to, before the project is loaded.
    virtual void startSimulator() {}
    // The tags registered, as a Tags table would list them (the demo's page shows them).
    using DemoTags = std::vector<gateway::TagTable::Row>;

    // Registers its tags, names them for readable output (EventPrinter::label) and lists them
    // in registered.
    virtual void addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) = 0;
    // Called at the start (second 0) and then once a second: makes values change.
    virtual void tick(nodeDB& db, int32_t second) = 0;
    // Stops the simulator, after the nodes are gone.
    virtual void stopSimulator() {}

  protected:
    struct DemoTag {
        int32_t handle;
        const char* address;
    };

    // The station's node in the loaded project (Object variable not set if it is missing).
    static std::shared_ptr<node> demoNode(nodeDB& db, const char* name);
    // Adds the tags to the station's node, each shown as "<node>.<address>" in readable output.
    static void addDemoTags(nodeDB& db, EventPrinter& printer, DemoTags& registered,
                            const char* name, std::initializer_list<DemoTag> tags);
};

}  // namespace maroset::cli
