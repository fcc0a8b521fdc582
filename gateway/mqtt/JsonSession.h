#pragma once

#include <string>
#include <string_view>

#include "gateway/mqtt/MqttSession.h"

namespace maroset::gateway {

// Plain JSON topics under a prefix P, every one retained but the errors:
//   P/$state                 "online"; "offline" as the will
//   P/NODE/TAGNAME           {"value": V, "time": "ISO 8601"} on every change
//   P/NODE/$link             the node's link status
//   P/NODE/TAGNAME/set       (subscribed) {"value": V} or V: a write, when writes are allowed
//   P/$errors                {"topic", "error", "time"} for a write refused or failed
// After a reconnect the changes kept meanwhile go out in order, then the latest value of every
// other tag, so a broker that lost its retained messages has them again.
class JsonSession final : public MqttSession {
  public:
    explicit JsonSession(MqttContext& context);

    void connecting() override;
    void connected() override;
    void disconnected() override {}
    bool publishing() const override;
    void change(TagChange change) override;
    void linkChanged(const LinkStatus& status) override;
    void message(const std::string& topic, std::string_view payload) override;

  private:
    bool publishValue(const TagChange& change);
    void refuse(const std::string& topic, const std::string& error);

    MqttContext& c_;
    std::string stateTopic_;
    std::string errorsTopic_;
};

}  // namespace maroset::gateway
