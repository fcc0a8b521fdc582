#pragma once

#include "core/LinkStatus.h"
#include "gateway/JsonWriter.h"

namespace maroset::gateway {

// A node's link status as the service shows it (the node list and the MQTT `$link` topics):
// {"node","driver","state","since","endpoint","counters":{...},"last":{"text","time"}|null}.
class LinkStatusJson {
  public:
    static void Write(JsonWriter& j, const LinkStatus& status);
};

}  // namespace maroset::gateway
