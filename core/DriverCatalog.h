#pragma once

#include <functional>
#include <memory>
#include <span>
#include <string_view>

#include "core/Driver.h"

namespace maroset {

class node;

// One driver family: the type key a node's Driver column names (upper-cased), the driver class
// it creates, and how node.Init configures and starts a new driver of that class. Each family
// has its own order of steps (most set what startup needs before it and TagPrefex and NodeName
// after it; the soft PLC gets NodeName first, the Intech driver gets it twice); the orders
// are intended and kept.
struct DriverFamily {
    // Runs one configuration step on the new driver, as one statement of node.Init under its
    // error trap.
    using Step = std::function<void(const std::function<void(Driver&)>&)>;

    std::string_view typeKey;
    std::string_view className;
    std::shared_ptr<Driver> (*create)();
    void (*configure)(const node& n, const Step& step);
};

// Every driver family, defined with the drivers in drivers/DriverCatalog.cpp: the one list a
// new driver family adds its row to. The first one, memory tags, is also the family of a type
// key no row names.
std::span<const DriverFamily> DriverFamilies();
// The family of an upper-cased type key (memory tags for a key no row names).
const DriverFamily& DriverFamilyOf(std::string_view typeKey);

}  // namespace maroset
