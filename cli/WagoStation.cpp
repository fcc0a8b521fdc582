#include "cli/WagoStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"
#include "sim/wago/WagoCouplerSimulator.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "Coupler";

}  // namespace

WagoStation::WagoStation() = default;
WagoStation::~WagoStation() = default;

void WagoStation::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)},
                                       {"Driver", Variant("WAGOIO")},
                                       {"IPAddress", Variant("127.0.0.1")},
                                       {"UpdateRate", Variant(int32_t{500})}});
}

void WagoStation::startSimulator() {
    coupler_ = std::make_unique<sim::WagoCouplerSimulator>();
    // The node connects to port 502, which stands for the simulator's port here.
    Runtime::current().setModbusPort(coupler_->port());
}

void WagoStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode,
                {{CountHandle, "IW0"},
                 {SwingHandle, "IW1"},
                 {InputBitHandle, "ID0.1"},
                 {OutputWordHandle, "OW0"},
                 {OutputBitHandle, "OD0.3"}});
}

void WagoStation::tick(nodeDB& db, int32_t second) {
    auto n = demoNode(db, kNode);
    if (second > 0 && second % 2 == 0)
        n->WriteTag(std::to_string(OutputWordHandle), Variant(second * 10));
    if (second > 0 && second % 3 == 0)
        n->WriteTag(std::to_string(OutputBitHandle), Variant((second / 3) % 2));
}

void WagoStation::stopSimulator() {
    coupler_.reset();
}

}  // namespace maroset::cli
