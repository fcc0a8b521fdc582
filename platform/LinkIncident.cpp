#include "platform/LinkIncident.h"

namespace maroset::platform {

std::string_view IncidentKindName(IncidentKind kind) {
    switch (kind) {
        case IncidentKind::Opening: return "opening";
        case IncidentKind::Opened: return "opened";
        case IncidentKind::OpenFailed: return "open-failed";
        case IncidentKind::Closed: return "closed";
        case IncidentKind::Sent: return "sent";
        case IncidentKind::Received: return "received";
        case IncidentKind::TimedOut: return "timed-out";
        case IncidentKind::Retried: return "retried";
        case IncidentKind::BadCheck: return "bad-check";
        case IncidentKind::Refused: return "refused";
        case IncidentKind::Dropped: return "dropped";
        case IncidentKind::Error: return "error";
        case IncidentKind::Note: return "note";
    }
    return "note";
}

const std::string& LinkIncident::text() const {
    if (!text_) text_ = source_ ? source_() : std::string();
    return *text_;
}

}  // namespace maroset::platform
