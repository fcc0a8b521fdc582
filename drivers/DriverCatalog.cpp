#include "core/DriverCatalog.h"

#include "drivers/df1/ClsDriverNuvAbDf1.h"
#include "drivers/intech/ClsDriverIntech.h"
#include "drivers/local/ClsDriverDiskTag.h"
#include "drivers/local/ClsDriverMemTag.h"
#include "drivers/opc/ClsDriverOPC.h"
#include "drivers/wago/ClsDriverWagoIO.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"

namespace maroset {

namespace {

template <class T>
std::shared_ptr<Driver> make() {
    return std::make_shared<T>();
}

struct DriverClass {
    std::string_view name;
    std::shared_ptr<Driver> (*create)();
};

// Every driver class a node can create, by class name. A new driver family adds its row here.
constexpr DriverClass kClasses[] = {
    {"ClsDriverMemTag", make<ClsDriverMemTag>},
    {"ClsDriverDiskTag", make<ClsDriverDiskTag>},
    {"ClsDriverNuvAbDf1", make<ClsDriverNuvAbDf1>},
    {"ClsDriverOPC", make<ClsDriverOPC>},
    {"ClsDriverIntech", make<ClsDriverIntech>},
    {"ClsDriverWagoIO", make<ClsDriverWagoIO>},
    {"ClsDriverNUVSoftPLC", make<ClsDriverNUVSoftPLC>},
};

}  // namespace

std::shared_ptr<Driver> CreateDriver(std::string_view className) {
    for (const DriverClass& c : kClasses) {
        if (c.name == className) return c.create();
    }
    // Classes not built yet fall back to memory tags, as an unknown type key does.
    return std::make_shared<ClsDriverMemTag>();
}

}  // namespace maroset
