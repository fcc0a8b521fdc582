#include "cli/SoftPlcStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/node.h"
#include "core/nodeDB.h"

namespace maroset::cli {

namespace {
constexpr const char* kNode = "SoftPLC";
}  // namespace

void SoftPlcStation::addNodes(const std::filesystem::path& project) {
    startSimulator();  // the node's row needs the port it listens on
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)},
                                       {"Driver", Variant("NUVTCPIP")},
                                       {"UpdateRate", Variant(int32_t{1000})},
                                       {"IPAddress", Variant("127.0.0.1")},
                                       {"Port", Variant(simulator_->port())}});
}

void SoftPlcStation::startSimulator() {
    if (simulator_) return;
    sim::SoftPlcSimulator::Options options;
    options.stepMs = 1000;
    options.splitGapMs = 50;
    options.oneValuePerFrame = true;
    simulator_ = sim::SoftPlcSimulator::OnLoopback(0, options);
}

void SoftPlcStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode,
                {{LevelHandle, "Level"}, {FlowHandle, "Flow"}, {SetpointHandle, "Setpoint"}});
}

void SoftPlcStation::tick(nodeDB& db, int32_t second) {
    if (second == 0 || second % 3 != 0) return;
    // The server takes the write and pushes the new value back.
    demoNode(db, kNode)->WriteTag(std::to_string(SetpointHandle), Variant(50 + second));
}

void SoftPlcStation::stopSimulator() {
    simulator_.reset();
}

}  // namespace maroset::cli
