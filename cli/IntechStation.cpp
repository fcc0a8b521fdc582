#include "cli/IntechStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/Runtime.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "sim/intech/IntechSimulator.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "Meter";

}  // namespace

IntechStation::IntechStation() = default;
IntechStation::~IntechStation() = default;

void IntechStation::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)},
                                       {"Driver", Variant("NUVINTECH")},
                                       {"UpdateRate", Variant(int32_t{500})},
                                       {"CommPort", Variant(int32_t{1})},
                                       {"BaudRate", Variant(int32_t{9600})}});
}

void IntechStation::startSimulator() {
    Runtime& rt = Runtime::current();
    simulator_ = sim::IntechSimulator::OnPseudoTerminal(rt.loop(), {"01", "02"});
    simulator_->setDrift(1000);
    // Port 1 is this node's only: another serial node keeps its own mapping.
    rt.mapSerialPort(1, simulator_->endpoint(), kNode);
}

void IntechStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    // One tag per reply, so that each value change reports one value.
    addDemoTags(db, printer, registered, kNode,
                {{FirstHandle, "01LAI1"},
                 {FirstHandle + 1, "01LAI6"},
                 {FirstHandle + 2, "01EAI17"},
                 {FirstHandle + 3, "02LDI1"},
                 {OutputHandle, "01LDO1"}});
}

void IntechStation::tick(nodeDB& db, int32_t second) {
    if (second == 0 || second % 3 != 0) return;
    // Output LDO1 on and off; the instrument answers OK and the status read shows it.
    demoNode(db, kNode)->WriteTag(std::to_string(OutputHandle), Variant(int16_t((second / 3) % 2)));
}

void IntechStation::stopSimulator() {
    simulator_.reset();
}

}  // namespace maroset::cli
