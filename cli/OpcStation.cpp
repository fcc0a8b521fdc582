#include "cli/OpcStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/nodeDB.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "Opc";
}  // namespace

void OpcStation::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)},
                                       {"Driver", Variant("OPC")},
                                       {"OPCServer", Variant("Maroset.Simulation")},
                                       {"UpdateRate", Variant(500)}});
}

void OpcStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode,
                {{RampHandle, "Ramp.Seconds"}, {SetpointHandle, "Static.Setpoint"}});
}

void OpcStation::tick(nodeDB& db, int32_t second) {
    // A saw tooth, 50, 60, 70, 80, 90, 50, ...: the server reports it at its next update.
    demoNode(db, kNode)->WriteTag(std::to_string(SetpointHandle), Variant(50 + (second % 5) * 10));
}

}  // namespace maroset::cli
