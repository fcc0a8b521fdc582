#pragma once

#include <cstdint>
#include <map>
#include <ostream>
#include <string>
#include <string_view>

#include "cli/Reply.h"
#include "core/LinkStatus.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset::cli {

// Writes the events and replies of the command, one line each, flushed at once so that a
// program reading the output sees every line as it happens.
//
// JSON lines:
//   {"event":"ValueChange","count":1,"handles":[7],"values":[3.5]}
//   {"event":"DriverError","driver":"...","from":"...","message":"..."}
//   {"reply":"write","ok":true}
//   {"reply":"write","ok":false,"error":{"number":13,"description":"Type mismatch"}}
//   {"reply":"nodes","ok":true,"nodes":[{"name":"Line1","driver":"DISKTAG"}]}
//   {"reply":"status","ok":true,"nodes":[{"name":"Line1","driver":"DISKTAG","link":{...}}]}
//   {"reply":"read","ok":false,"error":{"number":91,"description":"..."},"node":"Pump"}
// Readable lines:
//   ValueChange  7 = 3.5, 8 = "on"
//   DriverError  OPC  ClsDriverOPC.AddItem: message
//   write: ok
//   write: error 13: Type mismatch
//   nodes: ok: Line1 (DISKTAG), Mem (MEMTAG)
//   status: ok: Line1 (DISKTAG) local since 3/7/2026 9:00:00 AM, 0 requests, ...; Mem ...
// Readable text is written as the bytes it is; JSON escapes them (see JsonWriter).
class EventPrinter {
  public:
    EventPrinter(std::ostream& out, bool json);

    bool json() const { return json_; }

    void valueChange(const VbArray<int32_t>& handles, int16_t count,
                     const VbArray<Variant>& values);
    void driverError(const std::string& driver, const std::string& from,
                     const std::string& message);
    void reply(const Reply& r);
    // Writes one line as it is.
    void line(std::string_view text);

    // A name shown after a handle in readable output ("1 Memory.Ramp = 12.5").
    void label(int32_t handle, std::string name) { labels_[handle] = std::move(name); }

    int64_t valueChanges() const { return valueChanges_; }
    int64_t driverErrors() const { return driverErrors_; }

    // A value as readable output shows it: numbers as CStr, True/False, text in double quotes,
    // Empty, Null, arrays in parentheses.
    static std::string Readable(const Variant& v);
    // A node's link status on one line: "Line1 (NUVABDF1) up since 3/7/2026 9:00:00 AM, 12
    // requests, ..., last: TEXT at DATE TIME".
    static std::string ReadableStatus(const LinkStatus& status);

  private:
    std::ostream& out_;
    bool json_;
    std::map<int32_t, std::string> labels_;
    int64_t valueChanges_ = 0;
    int64_t driverErrors_ = 0;
};

}  // namespace maroset::cli
