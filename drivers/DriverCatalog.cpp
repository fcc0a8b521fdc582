#include "core/DriverCatalog.h"

#include "drivers/local/ClsDriverDiskTag.h"
#include "drivers/local/ClsDriverMemTag.h"

namespace maroset {

std::shared_ptr<Driver> CreateDriver(std::string_view className) {
    if (className == "ClsDriverDiskTag") return std::make_shared<ClsDriverDiskTag>();
    // Classes not built yet fall back to memory tags, as an unknown type key does.
    return std::make_shared<ClsDriverMemTag>();
}

}  // namespace maroset
