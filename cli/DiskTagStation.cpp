#include "cli/DiskTagStation.h"

#include "cli/EventPrinter.h"
#include "cli/ProjectDatabase.h"
#include "core/nodeDB.h"

namespace maroset::cli {

namespace {

constexpr const char* kNode = "Disk";
}  // namespace

void DiskTagStation::addNodes(const std::filesystem::path& project) {
    ProjectDatabase::AddNode(project, {{"Name", Variant(kNode)}, {"Driver", Variant("DISKTAG")}});
}

void DiskTagStation::addTags(nodeDB& db, EventPrinter& printer, DemoTags& registered) {
    addDemoTags(db, printer, registered, kNode, {{BatchCountHandle, "BatchCount"}});
}

void DiskTagStation::tick(nodeDB& db, int32_t second) {
    auto n = demoNode(db, kNode);
    if (second == 0) {
        n->ReadTag(BatchCountHandle);  // the stored text, "0" in a new file
        return;
    }
    n->WriteTag(std::to_string(BatchCountHandle), Variant(second));
}

}  // namespace maroset::cli
