#include "core/EventProcedure.h"

#include <string>

#include "core/Runtime.h"

namespace maroset {

void ReportUnhandled(std::string_view source, const VbError& error) {
    const platform::LinkTrace& trace = Runtime::current().trace();
    if (!trace.enabled()) return;
    std::string text = "error " + std::to_string(error.number());
    if (!error.source().empty()) text += " in " + error.source();
    text += ": " + error.description();
    trace.write(source, text);
}

}  // namespace maroset
