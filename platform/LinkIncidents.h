#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "lang/Event.h"
#include "platform/Clock.h"
#include "platform/LinkIncident.h"

namespace maroset::platform {

// The one stream of link incidents. Drivers and their port owners tell what happens on their
// links here, once, as a structured incident; everything that shows a link's health is a
// reader of this stream: the `--trace` printer, the link status of every node, the service's
// views. No reader changes what a driver does, and a driver keeps no diagnosis of its own.
//
// report() costs one test while nobody reads; the words of an incident are built only if a
// reader asks for them (LinkIncident::text()), so a frame dump is never formatted for a
// reader that only counts.
//
// Readers run synchronously inside report(), on the loop's thread. A reader must not throw
// and must not call back into the driver that reports.
class LinkIncidents {
  public:
    using Reader = std::function<void(const LinkIncident&)>;

    explicit LinkIncidents(const Clock& clock) : clock_(clock) {}

    // True while any reader is subscribed: report() is worth calling.
    bool wanted() const { return readers_.handlerCount() > 0; }

    [[nodiscard]] Subscription subscribe(Reader reader) {
        return readers_.subscribe(std::move(reader));
    }

    void report(std::string_view node, IncidentKind kind, std::string_view endpoint,
                std::string_view tag, const LinkIncident::TextSource& text) const {
        if (!wanted()) return;
        readers_.raise(LinkIncident(node, kind, endpoint, tag, clock_.now(), text));
    }
    void report(std::string_view node, IncidentKind kind, std::string_view endpoint,
                const LinkIncident::TextSource& text) const {
        report(node, kind, endpoint, {}, text);
    }

  private:
    const Clock& clock_;
    Event<const LinkIncident&> readers_;
};

}  // namespace maroset::platform
