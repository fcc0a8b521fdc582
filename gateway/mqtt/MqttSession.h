#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "core/LinkStatusBoard.h"
#include "gateway/TagDirectory.h"
#include "gateway/WallTime.h"
#include "gateway/mqtt/MqttClient.h"
#include "gateway/mqtt/MqttOptions.h"
#include "gateway/mqtt/ValueBuffer.h"
#include "platform/EventLoop.h"

namespace maroset::gateway {

// What a session uses of the publisher around it.
struct MqttContext {
    platform::EventLoop& loop;
    const platform::Clock& clock;
    MqttClient& client;
    TagDirectory& tags;
    const MqttOptions& options;
    LinkStatusBoard& links;
    const ValueBuffer& buffer;
    WallTime& wall;
    // Keeps a change that could not be published, for the replay after the reconnect.
    std::function<void(TagChange)> keep;
    // The kept changes, oldest first, handed over for the replay.
    std::function<std::deque<TagChange>()> takeKept;
    // Writes through the host's WriteTag; empty, or why the write failed.
    std::function<std::string(const TagEntry&, const Variant&)> write;
    // Tells a person something about the MQTT side (the trace, through the link incidents).
    std::function<void(const std::string&)> note;
};

// How the service speaks on its broker connection: plain JSON topics or a Sparkplug B edge
// node. The publisher tells the session what happens; the session decides what is sent.
class MqttSession {
  public:
    virtual ~MqttSession() = default;

    // Before every connect: the will for it.
    virtual void connecting() = 0;
    // The broker took us: subscribe, announce, replay what was kept.
    virtual void connected() = 0;
    virtual void disconnected() = 0;
    // Changes can be published now; otherwise the publisher keeps them.
    virtual bool publishing() const = 0;
    // A change while publishing(); a change the session cannot send after all it keeps.
    virtual void change(TagChange change) = 0;
    virtual void linkChanged(const LinkStatus& status) = 0;
    virtual void message(const std::string& topic, std::string_view payload) = 0;
};

}  // namespace maroset::gateway
