#include "gateway/LinkStatusJson.h"

namespace maroset::gateway {

void LinkStatusJson::Write(JsonWriter& j, const LinkStatus& s) {
    const LinkCounters& c = s.counters;
    auto count = [](uint64_t n) { return static_cast<int64_t>(n); };
    j.beginObject().key("name").string(s.node).key("driver").string(s.driver);
    j.key("link").beginObject().key("state").string(LinkStateName(s.state));
    j.key("since").time(s.since);
    j.key("counters").beginObject();
    j.key("requests").integer(count(c.requests)).key("replies").integer(count(c.replies));
    j.key("timeouts").integer(count(c.timeouts)).key("retries").integer(count(c.retries));
    j.key("badChecks").integer(count(c.badChecks));
    j.key("reconnects").integer(count(c.reconnects)).key("values").integer(count(c.values));
    j.key("driverErrors").integer(count(c.driverErrors)).endObject();
    j.key("last");
    if (s.last) {
        j.beginObject().key("text").string(s.last->text).key("time").time(s.last->time);
        j.endObject();
    } else {
        j.null();
    }
    j.endObject().endObject();
}

}  // namespace maroset::gateway
