#include "gateway/LinkStatusJson.h"

#include "gateway/WallTime.h"

namespace maroset::gateway {

void LinkStatusJson::Write(JsonWriter& j, const LinkStatus& s) {
    WallTime wall;
    const LinkCounters& c = s.counters;
    j.beginObject()
        .key("node").string(s.node)
        .key("driver").string(s.driver)
        .key("state").string(LinkStateName(s.state))
        .key("since").string(wall.iso8601(s.since))
        .key("endpoint").string(s.endpoint)
        .key("counters").beginObject()
        .key("requests").integer(static_cast<int64_t>(c.requests))
        .key("replies").integer(static_cast<int64_t>(c.replies))
        .key("timeouts").integer(static_cast<int64_t>(c.timeouts))
        .key("retries").integer(static_cast<int64_t>(c.retries))
        .key("badChecks").integer(static_cast<int64_t>(c.badChecks))
        .key("reconnects").integer(static_cast<int64_t>(c.reconnects))
        .key("values").integer(static_cast<int64_t>(c.values))
        .key("driverErrors").integer(static_cast<int64_t>(c.driverErrors))
        .endObject()
        .key("last");
    if (s.last)
        j.beginObject().key("text").string(s.last->text).key("time").string(wall.iso8601(s.last->time)).endObject();
    else
        j.null();
    j.endObject();
}

}  // namespace maroset::gateway
