#pragma once

#include <memory>
#include <string_view>

#include "core/Driver.h"

namespace maroset {

// The driver classes a node can create, by the class name its type key selects
// ("ClsDriverMemTag", "ClsDriverDiskTag", ...). A class that is not built yet gives a memory
// tag driver, as an unknown type key does.
//
// The node only names the class; the list of classes is defined with the drivers, in
// drivers/DriverCatalog.cpp, so a new driver family is one more row there.
std::shared_ptr<Driver> CreateDriver(std::string_view className);

}  // namespace maroset
