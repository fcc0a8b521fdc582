#include "core/EventProcedure.h"

#include <string>

#include "core/Runtime.h"

namespace maroset {

void ReportUnhandled(std::string_view source, const VbError& error, std::string_view endpoint) {
    Runtime::current().incidents().report(source, platform::IncidentKind::Error, endpoint, [&] {
        std::string text = "error " + std::to_string(error.number());
        if (!error.source().empty()) text += " in " + error.source();
        text += ": " + error.description();
        // The device or address, unless the description names it already.
        if (!endpoint.empty() && text.find(endpoint) == std::string::npos)
            text += " (" + std::string(endpoint) + ")";
        return text;
    });
}

}  // namespace maroset
