#include "core/DriverCatalog.h"

#include "drivers/local/ClsDriverMemTag.h"

namespace maroset {

std::shared_ptr<Driver> CreateDriver(std::string_view className) {
    // Classes not built yet fall back to memory tags, as an unknown type key does.
    (void)className;
    return std::make_shared<ClsDriverMemTag>();
}

}  // namespace maroset
