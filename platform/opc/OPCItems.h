#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "lang/Variant.h"
#include "lang/VbArray.h"
#include "platform/opc/OpcItemSource.h"

namespace maroset::platform {

class OpcItemSource;
struct OpcConnection;

// The items of one group (OPCGroup.OPCItems). Each item has the client's handle (quoted back
// in every event) and the server's handle (what the client names it by in reads, writes and
// removal), unique in the group and never 0. All arrays are one-based.
class OPCItems {
  public:
    OPCItems();
    ~OPCItems();
    OPCItems(const OPCItems&) = delete;
    OPCItems& operator=(const OPCItems&) = delete;

    // Number of items in the group.
    int32_t Count() const { return live_; }

    // Adds NumItems items: ItemIDs(i) with client handle ClientHandles(i). ServerHandles and
    // Errors are re-dimensioned 1 to NumItems: for each item its server handle and S_OK, or 0
    // and the code that refused it (OPC_E_UNKNOWNITEMID, ...). A refused item does not fail
    // the call. NumItems below 1 fails with E_INVALIDARG; input arrays shorter than NumItems
    // with Subscript out of range.
    void AddItems(int32_t NumItems, const VbArray<std::string>& ItemIDs,
                  const VbArray<int32_t>& ClientHandles, VbArray<int32_t>& ServerHandles,
                  VbArray<int32_t>& Errors);
    // Removes NumItems items by server handle; Errors(i) is S_OK or OPC_E_INVALIDHANDLE.
    void Remove(int32_t NumItems, const VbArray<int32_t>& ServerHandles, VbArray<int32_t>& Errors);

    // One item as the group keeps it.
    struct Entry {
        int32_t serverHandle = 0;
        int32_t clientHandle = 0;
        std::string itemID;
        std::shared_ptr<OpcItemSource> source;  // null once removed
        // What the group last reported in a data change.
        bool reported = false;
        Variant lastValue;
        int32_t lastQuality = 0;
    };

  private:
    friend class OPCGroup;
    void attach(std::shared_ptr<OpcConnection> connection);
    // The group's scan, handed to every item now and to each item added later.
    void scan(const OpcScan& scan);
    // The live item of a server handle; null when there is none.
    Entry* find(int32_t serverHandle);
    // Every live item, in the order they were added.
    template <class F>
    void forEach(F&& f) {
        for (Entry& e : entries_) {
            if (e.source) f(e);
        }
    }
    void compact();

    std::shared_ptr<OpcConnection> connection_;
    std::vector<Entry> entries_;                    // in the order added; removed ones are
    std::unordered_map<int32_t, size_t> byHandle_;  // dropped in batches
    int32_t live_ = 0;
    int32_t nextHandle_ = 1;
    OpcScan scan_;
};

}  // namespace maroset::platform
