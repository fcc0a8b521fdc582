#include "cli/DemoStation.h"

#include "cli/EventPrinter.h"
#include "core/node.h"
#include "core/nodeDB.h"
#include "lang/VbError.h"

namespace maroset::cli {

std::shared_ptr<node> DemoStation::demoNode(nodeDB& db, const char* name) {
    auto n = db.getNode(name);
    if (!n) throw VbError(err::ObjectNotSet);
    return n;
}

void DemoStation::addDemoTags(nodeDB& db, EventPrinter& printer, DemoTags& registered,
                              const char* name, std::initializer_list<DemoTag> tags) {
    const auto n = demoNode(db, name);
    for (const DemoTag& t : tags) {
        n->AddTag(t.handle, t.address);
        printer.label(t.handle, std::string(name) + "." + t.address);
        registered.push_back({name, t.handle, t.address, t.address});
    }
}

}  // namespace maroset::cli
