#include "EventHandlers.h"

#include <utility>

#include "VariantConversion.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

// Calls without building an argument tuple: this is the path of every value change.
template <class... Args>
void CallReporting(const py::function& callable, const Args&... args) {
    PyObject* const argv[] = {args.ptr()...};
    PyObject* result = PyObject_Vectorcall(callable.ptr(), argv, sizeof...(Args), nullptr);
    if (result) {
        Py_DECREF(result);
        return;
    }
    py::error_already_set error;
    error.discard_as_unraisable(callable);
}

}  // namespace

ValueChangeEvent::Handler PythonHandler(ValueChangeEvent&, py::function callable) {
    return [callable = std::move(callable)](VbArray<int32_t>& TagIDs, int16_t NumItems,
                                            VbArray<Variant>& Values) {
        CallReporting(callable, ToList(TagIDs), py::int_(NumItems), ToList(Values));
    };
}

DriverErrorEvent::Handler PythonHandler(DriverErrorEvent&, py::function callable) {
    return [callable = std::move(callable)](const std::string& Driver, const std::string& FromSub,
                                            const std::string& Message) {
        CallReporting(callable, TextToPython(Driver), TextToPython(FromSub), TextToPython(Message));
    };
}

ReportValuesEvent::Handler PythonHandler(ReportValuesEvent&, py::function callable) {
    return [callable = std::move(callable)](std::string_view node, const VbArray<int32_t>& TagIDs,
                                            int16_t NumItems, const VbArray<Variant>& Values) {
        CallReporting(callable, TextToPython(std::string(node)), ToList(TagIDs), py::int_(NumItems),
                      ToList(Values));
    };
}

ReportErrorsEvent::Handler PythonHandler(ReportErrorsEvent&, py::function callable) {
    return
        [callable = std::move(callable)](std::string_view node, const std::string& Driver,
                                         const std::string& FromSub, const std::string& Message) {
            CallReporting(callable, TextToPython(std::string(node)), TextToPython(Driver),
                          TextToPython(FromSub), TextToPython(Message));
        };
}

}  // namespace maroset::python
