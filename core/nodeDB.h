#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "core/node.h"
#include "lang/Event.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

// ValueChange(TagIDs, NumItems, Values): one-based arrays of the same length, passed on by
// reference from the reporting driver.
using ValueChangeEvent = Event<VbArray<int32_t>&, int16_t, VbArray<Variant>&>;
// DriverError(Driver, FromSub, Message).
using DriverErrorEvent = Event<const std::string&, const std::string&, const std::string&>;

// The project's nodes: loaded from the Nodes table of a project database, kept in an ordered
// collection keyed by name (keys compare without regard to letter case), switched on and off
// together, and the one funnel through which every driver reports to the hosts.
//
// Every operation runs under the trap with module name "NodeDB".
class nodeDB {
  public:
    nodeDB();
    ~nodeDB();
    nodeDB(const nodeDB&) = delete;
    nodeDB& operator=(const nodeDB&) = delete;

    // "MEMTAG", "OPC", "NUVABDF1", "DiskTag", "WagoIO", "NUVIntech", "NUVTCPIP", index 1 to 7.
    Variant GetDrivers();
    // The type number of each entry of GetDrivers: "1", "2", "3", "4", "5", "3", "2".
    Variant GetDriverType();
    // The node with that name, or nothing (never an error).
    std::shared_ptr<node> getNode(const std::string& NodeName);
    int32_t count();
    void AddNode(const std::string& NodeName, const std::string& DriverName,
                 const std::string& OPCTopic = "", int32_t ScanRate = 0, int32_t TagPrefex = 0);
    // Loads every row of the Nodes table of the database at ProjectDBName (a native path, or a
    // path on drive C:) with "select * from Nodes ".
    void AddAllNodes(const std::string& ProjectDBName);
    void RemoveNode(const std::string& NodeName);
    void RemoveAllNodes();
    void NewValue(VbArray<int32_t>& TagIDs, int16_t NumItems, VbArray<Variant>& Values);
    void StartScanning();
    void StopScanning();
    void NUVError(const std::string& Driver, const std::string& FromSub,
                  const std::string& Message);

    // The nodes in collection order.
    std::vector<std::shared_ptr<node>> nodes() const;

    ValueChangeEvent ValueChange;
    DriverErrorEvent DriverError;

  private:
    struct Collection;
    Collection& collection();

    std::unique_ptr<Collection> nodes_;
};

}  // namespace maroset
