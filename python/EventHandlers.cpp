#include "EventHandlers.h"

#include <utility>

#include "VariantConversion.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

template <class... Args>
void CallReporting(const py::function& callable, Args&&... args) {
    try {
        callable(std::forward<Args>(args)...);
    } catch (py::error_already_set& e) {
        e.discard_as_unraisable(callable);
    }
}

}  // namespace

ValueChangeEvent::Handler PythonHandler(ValueChangeEvent&, py::function callable) {
    return [callable = std::move(callable)](VbArray<int32_t>& TagIDs, int16_t NumItems,
                                            VbArray<Variant>& Values) {
        CallReporting(callable, ToList(TagIDs), NumItems, ToList(Values));
    };
}

DriverErrorEvent::Handler PythonHandler(DriverErrorEvent&, py::function callable) {
    return [callable = std::move(callable)](const std::string& Driver, const std::string& FromSub,
                                            const std::string& Message) {
        CallReporting(callable, TextToPython(Driver), TextToPython(FromSub), TextToPython(Message));
    };
}

}  // namespace maroset::python
