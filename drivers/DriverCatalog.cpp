#include "core/DriverCatalog.h"

#include "drivers/df1/ClsDriverNuvAbDf1.h"
#include "drivers/intech/ClsDriverIntech.h"
#include "drivers/local/ClsDriverDiskTag.h"
#include "drivers/local/ClsDriverMemTag.h"
#include "drivers/opc/ClsDriverOPC.h"
#include "drivers/softplc/ClsDriverNUVSoftPLC.h"
#include "drivers/wago/ClsDriverWagoIO.h"
#include "lang/VbError.h"

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
    {"ClsDriverIntech", make<ClsDriverIntech>},
    {"ClsDriverNUVSoftPLC", make<ClsDriverNUVSoftPLC>},
    {"ClsDriverWagoIO", make<ClsDriverWagoIO>},
    {"ClsDriverOPC", make<ClsDriverOPC>},
};

}  // namespace

std::shared_ptr<Driver> CreateDriver(std::string_view className) {
    for (const DriverClass& c : kClasses) {
        if (c.name == className) return c.create();
    }
    // The node asks only for the classes above; anything else is a class the library lacks.
    throw VbError(err::CantCreateObject);
}

}  // namespace maroset
