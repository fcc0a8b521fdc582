#include "cli/Df1Station.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "PLC";
}  // namespace

void Df1Station::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)},
                                       {"Driver", Variant("NUVABDF1")},
                                       {"UpdateRate", Variant(int32_t{500})},
                                       {"CommPort", Variant(int32_t{1})}});
}

void Df1Station::startSimulator() {
    Runtime& rt = Runtime::current();
    plc_ = sim::Df1Simulator::OnPseudoTerminal(rt.loop());
    plc_->drift(700);
    // For this node only, so another serial station can have port 1 too.
    rt.mapSerialPort(1, plc_->endpoint(), kNode);
}

void Df1Station::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode,
                {{CounterHandle, "N7:0"},
                 {LevelHandle, "N7:1"},
                 {PatternHandle, "N7:2"},
                 {SetpointHandle, "N7:4"}});
}

void Df1Station::tick(nodeDB& db, int32_t second) {
    if (second % 3 != 1) return;
    if (!writer_) {
        writer_ = std::make_unique<platform::Timer>(Runtime::current().loop());
        writer_->Interval(250);  // the node polls every 500 ms, in step with the demo's seconds
        write_ = writer_->Tick.subscribe([this, &db] {
            writer_->Enabled(false);
            demoNode(db, kNode)->WriteTag(std::to_string(SetpointHandle), Variant(setpoint_));
        });
    }
    setpoint_ = 100 + second;
    writer_->Enabled(true);
}

void Df1Station::stopSimulator() {
    write_.reset();
    writer_.reset();
    plc_.reset();
}

}  // namespace maroset::cli
