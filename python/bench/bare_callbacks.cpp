// The reference loop of value_changes.py: what calling a Python callable with a one-tag
// value report costs when nothing but pybind11 stands between them.

#include <pybind11/pybind11.h>

namespace py = pybind11;

PYBIND11_MODULE(_maroset_bench, m) {
    m.def("bare", [](const py::function& callback, int count) {
        for (int i = 0; i < count; ++i) {
            py::list handles(1);
            handles[0] = py::int_(1);
            py::list values(1);
            values[0] = py::float_(static_cast<double>(i));
            callback(handles, 1, values);
        }
    });
}
