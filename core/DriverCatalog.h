#pragma once

#include <memory>
#include <string_view>

#include "core/Driver.h"

namespace maroset {

// The driver classes a node can create, by the class name its type key selects
// ("ClsDriverMemTag", "ClsDriverDiskTag", ...). A name the catalog does not hold fails with
// ActiveX component can't create object (429); an unknown type key never gets here, the node
// makes a memory tag driver for it.
//
// The node only names the class; the list of classes is defined with the drivers, in
// drivers/DriverCatalog.cpp, so a new driver family is one more row there.
std::shared_ptr<Driver> CreateDriver(std::string_view className);

}  // namespace maroset
