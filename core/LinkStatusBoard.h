#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "core/LinkStatus.h"
#include "core/ReportTap.h"
#include "lang/Event.h"
#include "lang/VbError.h"
#include "platform/Clock.h"
#include "platform/LinkIncidents.h"

namespace maroset {

// The link status of every node: a reader of the link incidents and of what drivers report,
// kept by node name. A C++ host reads it through Runtime::current().linkStatus(); the
// command's `status` and the service's views read it the same way.
//
// Nodes enter when they are started (node.Init) and leave when they are destroyed. It only
// observes: nothing here changes what a driver or node does.
class LinkStatusBoard {
  public:
    LinkStatusBoard(platform::LinkIncidents& incidents, ReportTap& reports,
                    const platform::Clock& clock);
    LinkStatusBoard(const LinkStatusBoard&) = delete;
    LinkStatusBoard& operator=(const LinkStatusBoard&) = delete;

    // Every node's status, ordered by name (letter case ignored).
    std::vector<LinkStatus> All() const;
    // One node's status (name in any letter case); null when no such node was started.
    const LinkStatus* Find(std::string_view node) const;

    // Raised when a node's state changes (after the status is updated).
    Event<const LinkStatus&> StateChanged;

    // --- fed by the core ---
    // A node is being started (node.Init) with this driver type, until the scope ends; `owner`
    // identifies the node object, so a node destroyed after another took its name does not
    // remove the newer one. An error raised or trapped meanwhile means its driver did not
    // start: the node is down, with that error as its last incident.
    class StartScope {
      public:
        StartScope(LinkStatusBoard& board, std::string_view node, const void* owner);
        ~StartScope();
        StartScope(const StartScope&) = delete;
        StartScope& operator=(const StartScope&) = delete;
        // The driver type, once the node knows it.
        void typeKnown(std::string_view driverType);

      private:
        LinkStatusBoard& board_;
        std::string node_;
        std::string previous_;
    };
    // An error met while a node is starting (raised, or trapped and skipped).
    void StartError(const VbError& error);
    void NodeGone(std::string_view node, const void* owner);

  private:
    struct Entry {
        LinkStatus status;
        const void* owner = nullptr;
        bool everUp = false;
        bool lost = false;  // went down after being up: the next up is a reconnect
    };

    Entry* entry(std::string_view node);
    void read(const platform::LinkIncident& incident);
    void moveTo(Entry& e, LinkState state, platform::DateTime when);
    void remember(Entry& e, std::string text, platform::DateTime when);

    const platform::Clock& clock_;
    std::string starting_;  // the node being started, upper-cased; empty when none
    // Keyed by the upper-cased node name, as the node collection's keys are.
    std::map<std::string, Entry, std::less<>> entries_;
    Subscription reading_;
    Subscription countingValues_;
    Subscription countingErrors_;
};

}  // namespace maroset
