#pragma once

#include <memory>

#include "core/nodeDB.h"
#include "lang/Subscription.h"

namespace maroset {

// The class a host creates to use the drivers. Every instance shows the one process-wide
// nodeDB and re-raises its ValueChange and DriverError events unchanged, with the driver's
// own arrays. Releasing a façade stops nothing.
//
//     maroset::ClsNodeDBInterface host;
//     auto sub = host.ValueChange.subscribe([](auto& ids, int16_t n, auto& values) { ... });
//     host.nodeDB()->AddAllNodes("/srv/plant/project.db");
//     host.nodeDB()->getNode("Line1")->AddTag(7, "N7:0");
//     host.nodeDB()->StartScanning();
class ClsNodeDBInterface {
  public:
    // Class_Initialize: attaches to the process-wide nodeDB, creating it on first use.
    ClsNodeDBInterface();
    ~ClsNodeDBInterface();
    ClsNodeDBInterface(const ClsNodeDBInterface&) = delete;
    ClsNodeDBInterface& operator=(const ClsNodeDBInterface&) = delete;

    const std::shared_ptr<maroset::nodeDB>& nodeDB() const { return nodeDB_; }
    // Attaches to another nodeDB (object assignment): its events are re-raised from now on.
    void nodeDB(std::shared_ptr<maroset::nodeDB> db);

    ValueChangeEvent ValueChange;
    DriverErrorEvent DriverError;

  private:
    void nodeDB_valuechange(VbArray<int32_t>& TagIDs, int16_t NumItems, VbArray<Variant>& Values);
    void nodeDB_DriverError(const std::string& Driver, const std::string& FromSub,
                            const std::string& Message);

    std::shared_ptr<maroset::nodeDB> nodeDB_;
    Subscription valueChange_;
    Subscription driverError_;
};

}  // namespace maroset
