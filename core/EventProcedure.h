#pragma once

#include <string_view>

#include "lang/VbError.h"

namespace maroset {

// The edge of an event procedure that the loop calls: a timer tick, a serial receive event, a
// socket event. Inside, the procedure runs under its own trap like any other. A run-time error
// that still leaves it (the trap switch is off) has no caller to go to: the host's loop
// called it. It is told as an error incident of `source` (the node's name) at `endpoint` (the
// device or address of its link, when known) and dropped, so a dead device or a bad frame
// never stops the host; the driver's next tick tries again.
void ReportUnhandled(std::string_view source, const VbError& error, std::string_view endpoint = {});

template <class Body>
void RunEventProcedure(std::string_view source, Body&& body, std::string_view endpoint = {}) {
    try {
        body();
    } catch (const VbError& e) {
        ReportUnhandled(source, e, endpoint);
    }
}

}  // namespace maroset
