#pragma once

#include <cstdint>
#include <string>

#include "lang/Variant.h"
#include "platform/Clock.h"

namespace maroset::platform {

// What a server knows of one item at a moment: its value, the quality word (192 good) and the
// time the value was taken.
struct OpcItemState {
    Variant value;
    int32_t quality = 0;
    DateTime timeStamp{};
};

// How the group that holds an item scans it: whether the group is active, its update rate,
// and its name (a driver names its group after its node).
struct OpcScan {
    bool active = false;
    int32_t updateRate = 0;
    std::string group;
};

// One item of a server's address space, as one group of one client holds it (what
// OpcServerBackend::AddItem hands out). Called only on the loop's thread.
class OpcItemSource {
  public:
    virtual ~OpcItemSource() = default;

    // The item's current state, as the server's cache has it.
    virtual OpcItemState Read() = 0;
    // Whether the item's access rights allow writing; AsyncWrite refuses the write with
    // OPC_E_BADRIGHTS before anything is sent when they do not.
    virtual bool Writable() const = 0;
    // Writes a value to the item; the result code of the write (S_OK, OPC_E_BADTYPE,
    // OPC_E_RANGE, ...).
    virtual int32_t Write(const Variant& value) = 0;
    // The group's scan, once the item is added and whenever it changes. A server whose
    // values come by subscription (an OPC UA server) subscribes at this rate while active;
    // one that is read on demand ignores it.
    virtual void Scan(const OpcScan&) {}
};

}  // namespace maroset::platform
