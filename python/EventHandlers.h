#pragma once

#include <pybind11/pybind11.h>

#include "core/ReportTap.h"
#include "core/nodeDB.h"

namespace maroset::python {

// The library-side handler that calls a Python callable with the event's arguments, in
// Python's terms (report arrays as lists). An exception the callable raises is reported
// through sys.unraisablehook and goes no further: the driver that raised the event, and the
// loop, carry on.
//
// Handlers run on the loop's thread with the interpreter lock held: the loop gives it up only
// while it sleeps.
ValueChangeEvent::Handler PythonHandler(ValueChangeEvent& event, pybind11::function callable);
DriverErrorEvent::Handler PythonHandler(DriverErrorEvent& event, pybind11::function callable);

// The runtime's reports by node: (node, handles, count, values) and (node, driver, source,
// message).
using ReportValuesEvent = decltype(ReportTap::Values);
using ReportErrorsEvent = decltype(ReportTap::Errors);
ReportValuesEvent::Handler PythonHandler(ReportValuesEvent& event, pybind11::function callable);
ReportErrorsEvent::Handler PythonHandler(ReportErrorsEvent& event, pybind11::function callable);

}  // namespace maroset::python
