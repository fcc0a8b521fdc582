#pragma once

#include "core/LinkStatus.h"
#include "gateway/JsonWriter.h"

namespace maroset::gateway {

// One node's link status as JSON, the same for the HTTP API and `maroset run`'s `status`:
//
//     {"name":"Line1","driver":"NUVABDF1","link":{"state":"up","since":"2026-03-07T09:00:00.000",
//      "counters":{"requests":12,"replies":12,"timeouts":0,"retries":0,"badChecks":0,
//      "reconnects":0,"values":40,"driverErrors":0},"last":{"text":"...","time":"..."}}}
//
// "last" is null until something worth a person's attention happened.
class LinkStatusJson {
  public:
    static void Write(JsonWriter& j, const LinkStatus& status);
};

}  // namespace maroset::gateway
