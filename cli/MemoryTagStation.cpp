#include "cli/MemoryTagStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/nodeDB.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "Memory";
}  // namespace

void MemoryTagStation::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)}, {"Driver", Variant("MEMTAG")}});
}

void MemoryTagStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode,
                {{SetpointHandle, "Setpoint"}, {RunningHandle, "Running"}});
}

void MemoryTagStation::tick(nodeDB& db, int32_t second) {
    auto n = demoNode(db, kNode);
    // A saw tooth: 20, 22.5, 25, 27.5, 30, 20, ...
    n->WriteTag(std::to_string(SetpointHandle), Variant(20.0 + (second % 5) * 2.5));
    if (second % 4 == 0) n->WriteTag(std::to_string(RunningHandle), Variant(second % 8 == 0));
}

}  // namespace maroset::cli
