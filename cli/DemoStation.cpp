#include "cli/DemoStation.h"

#include "core/nodeDB.h"
#include "lang/VbError.h"

namespace maroset::cli {

std::shared_ptr<node> DemoStation::demoNode(nodeDB& db, const char* name) {
    auto n = db.getNode(name);
    if (!n) throw VbError(err::ObjectNotSet);
    return n;
}

}  // namespace maroset::cli
