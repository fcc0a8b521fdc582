#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "core/Runtime.h"
#include "platform/LinkIncident.h"

namespace maroset::test {

// Every link incident of the current runtime while it lives, as "NODE: TEXT" lines and with
// its kind, endpoint and tag.
class IncidentRecorder {
  public:
    struct Entry {
        std::string node;
        platform::IncidentKind kind;
        std::string endpoint;
        std::string tag;
        std::string text;
    };

    IncidentRecorder()
        : reading_(
              Runtime::current().incidents().subscribe([this](const platform::LinkIncident& i) {
                  entries.push_back({std::string(i.node()), i.kind(), std::string(i.endpoint()),
                                     std::string(i.tag()), i.text()});
                  lines.push_back(std::string(i.node()) + ": " + i.text());
              })) {}

    // True when a line contains `part`.
    bool has(std::string_view part) const {
        for (const auto& l : lines)
            if (l.find(part) != std::string::npos) return true;
        return false;
    }
    // The first incident whose text contains `part`; null when none.
    const Entry* find(std::string_view part) const {
        for (const auto& e : entries)
            if (e.text.find(part) != std::string::npos) return &e;
        return nullptr;
    }
    size_t count(std::string_view part) const {
        size_t n = 0;
        for (const auto& l : lines)
            if (l.find(part) != std::string::npos) ++n;
        return n;
    }

    std::vector<std::string> lines;
    std::vector<Entry> entries;

  private:
    Subscription reading_;
};

}  // namespace maroset::test
