#include "gateway/mqtt/JsonSession.h"

#include <set>

#include "gateway/JsonWriter.h"
#include "gateway/LinkStatusJson.h"
#include "gateway/mqtt/MqttCommand.h"

namespace maroset::gateway {

namespace {

constexpr int kQos = 1;
// A hostile topic is quoted back in an error only this far.
constexpr size_t kTopicQuoted = 256;

}  // namespace

JsonSession::JsonSession(MqttContext& context)
    : c_(context),
      stateTopic_(context.options.prefix + "/$state"),
      errorsTopic_(context.options.prefix + "/$errors") {}

void JsonSession::connecting() {
    c_.client.setWill(stateTopic_, "offline", kQos, true);
}

void JsonSession::connected() {
    c_.client.subscribe(c_.options.prefix + "/+/+/set", kQos);
    c_.client.publish(stateTopic_, "online", kQos, true);
    for (const LinkStatus& s : c_.links.All()) linkChanged(s);
    std::set<const TagEntry*> replayed;
    std::deque<TagChange> kept = c_.takeKept();
    while (!kept.empty()) {
        if (!publishValue(kept.front())) break;
        replayed.insert(kept.front().tag);
        kept.pop_front();
    }
    if (!kept.empty()) {  // lost the broker again: keep the rest, in order
        for (TagChange& change : kept) c_.keep(std::move(change));
        return;
    }
    for (TagEntry& tag : c_.tags.all())
        if (!tag.value.isEmpty() && !replayed.contains(&tag))
            publishValue(TagChange{&tag, tag.value, tag.time});
}

bool JsonSession::publishing() const {
    return c_.client.state() == MqttClient::State::Connected;
}

void JsonSession::change(TagChange change) {
    if (!publishValue(change)) c_.keep(std::move(change));
}

bool JsonSession::publishValue(const TagChange& change) {
    JsonWriter j;
    j.beginObject().key("value").value(change.value).key("time").time(change.time).endObject();
    const TagEntry& tag = *change.tag;
    return c_.client.publish(c_.options.prefix + "/" + tag.node + "/" + tag.name, j.str(), kQos,
                             true);
}

void JsonSession::linkChanged(const LinkStatus& status) {
    JsonWriter j;
    LinkStatusJson::Write(j, status);
    c_.client.publish(c_.options.prefix + "/" + status.node + "/$link", j.str(), kQos, true);
}

void JsonSession::message(const std::string& topic, std::string_view payload) {
    // P/NODE/TAGNAME/set, nothing else: the subscription's wildcards allow no more levels.
    const size_t nodeStart = c_.options.prefix.size() + 1;
    const size_t nodeEnd = topic.find('/', nodeStart);
    const size_t tagEnd = topic.rfind('/');
    if (nodeEnd == std::string::npos || tagEnd <= nodeEnd || topic.substr(tagEnd) != "/set")
        return;
    if (!c_.options.allowWrites) {
        refuse(topic, "writes are not allowed (the service runs without --allow-writes)");
        return;
    }
    const std::string node = topic.substr(nodeStart, nodeEnd - nodeStart);
    const std::string name = topic.substr(nodeEnd + 1, tagEnd - nodeEnd - 1);
    const TagEntry* tag = c_.tags.byName(node, name);
    if (!tag) {
        refuse(topic, "no such tag");
        return;
    }
    std::string error;
    const std::optional<Variant> value = MqttCommand::ParseSet(payload, error);
    if (!value) {
        refuse(topic, error);
        return;
    }
    error = c_.write(*tag, *value);
    if (!error.empty()) refuse(topic, error);
}

void JsonSession::refuse(const std::string& topic, const std::string& error) {
    JsonWriter j;
    j.beginObject()
        .key("topic").string(std::string_view(topic).substr(0, kTopicQuoted))
        .key("error").string(error)
        .key("time").time(c_.clock.now())
        .endObject();
    c_.client.publish(errorsTopic_, j.str(), kQos, false);
}

}  // namespace maroset::gateway
