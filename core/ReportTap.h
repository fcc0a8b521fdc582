#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "lang/Event.h"
#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

// What drivers report to the host, told again node by node for observers beside the host:
// the link status, the service's tag table and event stream, the MQTT publisher. The host's
// own ValueChange and DriverError carry no node (a handle is the host's, and two nodes may
// use the same one); these do.
//
// Raised just before the host's event, on the loop's thread, with the report's own arrays.
// A handler must not throw and must not keep the arrays.
class ReportTap {
  public:
    // node, one-based handles, count as reported, one-based values.
    Event<std::string_view, const VbArray<int32_t>&, int16_t, const VbArray<Variant>&> Values;
    // node, driver label, "Class.Procedure", message.
    Event<std::string_view, const std::string&, const std::string&, const std::string&> Errors;
};

}  // namespace maroset
