#include "VariantConversion.h"

#include <limits>

#include "lang/VbError.h"

namespace py = pybind11;

namespace maroset::python {

namespace {

// Kept for the life of the process: the library may still hold values at interpreter exit.
py::object* empty_ = nullptr;

py::object Steal(PyObject* object) {
    if (!object) throw py::error_already_set();
    return py::reinterpret_steal<py::object>(object);
}

Variant IntegerFromPython(py::handle value) {
    int overflow = 0;
    const long long n = PyLong_AsLongLongAndOverflow(value.ptr(), &overflow);
    if (n == -1 && PyErr_Occurred()) throw py::error_already_set();
    if (overflow != 0 || n < std::numeric_limits<int32_t>::min() ||
        n > std::numeric_limits<int32_t>::max())
        throw VbError(err::Overflow);
    if (n >= std::numeric_limits<int16_t>::min() && n <= std::numeric_limits<int16_t>::max())
        return Variant(static_cast<int16_t>(n));
    return Variant(static_cast<int32_t>(n));
}

}  // namespace

py::object EmptyValue() {
    return *empty_;
}

void SetEmptyValue(py::object empty) {
    if (!empty_) empty_ = new py::object();
    *empty_ = std::move(empty);
}

py::str TextToPython(const std::string& bytes) {
    return py::reinterpret_steal<py::str>(
        Steal(PyUnicode_DecodeUTF8(bytes.data(), static_cast<Py_ssize_t>(bytes.size()),
                                   "surrogateescape"))
            .release());
}

std::string TextFromPython(py::handle text) {
    const py::object encoded =
        Steal(PyUnicode_AsEncodedString(text.ptr(), "utf-8", "surrogateescape"));
    return std::string(PyBytes_AS_STRING(encoded.ptr()),
                       static_cast<size_t>(PyBytes_GET_SIZE(encoded.ptr())));
}

std::string PathFromPython(py::handle path) {
    return TextFromPython(py::module_::import("os").attr("fsdecode")(path));
}

py::list ToList(const VbArray<int32_t>& items) {
    py::list list(static_cast<size_t>(items.size()));
    size_t i = 0;
    for (const int32_t item : items)
        PyList_SET_ITEM(list.ptr(), i++, Steal(PyLong_FromLong(item)).release().ptr());
    return list;
}

py::list ToList(const VbArray<Variant>& items) {
    py::list list(static_cast<size_t>(items.size()));
    size_t i = 0;
    for (const Variant& item : items)
        PyList_SET_ITEM(list.ptr(), i++, ToPython(item).release().ptr());
    return list;
}

py::object ToPython(const Variant& value) {
    switch (value.type()) {
        case VarType::Empty:
            return EmptyValue();
        case VarType::Null:
            return py::none();
        case VarType::Integer:
            return py::int_(value.integer());
        case VarType::Long:
            return py::int_(value.lng());
        case VarType::Single:
            return py::float_(value.single());
        case VarType::Double:
            return py::float_(value.dbl());
        // A Date kind maps to datetime.datetime here, and back in FromPython.
        case VarType::String:
            return TextToPython(value.string());
        case VarType::Boolean:
            return py::bool_(value.boolean());
        case VarType::Array:
            return ToList(value.array());
        case VarType::Object:
            return value.object() ? ToPython(value.object()->defaultValue()) : py::none();
    }
    throw VbError(err::TypeMismatch);
}

Variant FromPython(py::handle value) {
    PyObject* object = value.ptr();
    if (value.is(*empty_)) return Variant();
    if (value.is_none()) return Variant::Null();
    if (PyBool_Check(object)) return Variant(object == Py_True);
    if (PyLong_Check(object)) return IntegerFromPython(value);
    if (PyFloat_Check(object)) return Variant(PyFloat_AS_DOUBLE(object));
    if (PyUnicode_Check(object)) return Variant(TextFromPython(value));
    if (PyBytes_Check(object))
        return Variant(
            std::string(PyBytes_AS_STRING(object), static_cast<size_t>(PyBytes_GET_SIZE(object))));
    if (PyByteArray_Check(object))
        return Variant(std::string(PyByteArray_AS_STRING(object),
                                   static_cast<size_t>(PyByteArray_GET_SIZE(object))));
    if (PyList_Check(object) || PyTuple_Check(object)) return Variant(ArrayFromPython(value, 0));
    // datetime.datetime joins here as a Date once the run-time layer has that kind.
    // Other integers (NumPy's, IntEnum's) and other numbers take their plain form.
    if (PyIndex_Check(object)) return IntegerFromPython(Steal(PyNumber_Index(object)));
    if (PyObject_HasAttrString(object, "__float__")) {
        const double d = PyFloat_AsDouble(object);
        if (d == -1.0 && PyErr_Occurred()) throw py::error_already_set();
        return Variant(d);
    }
    throw VbError(err::TypeMismatch);
}

VbArray<Variant> ArrayFromPython(py::handle sequence, int32_t lower) {
    if (!PyList_Check(sequence.ptr()) && !PyTuple_Check(sequence.ptr()))
        throw VbError(err::TypeMismatch);
    const py::sequence items = py::reinterpret_borrow<py::sequence>(sequence);
    std::vector<Variant> values;
    values.reserve(items.size());
    for (const py::handle item : items) values.push_back(FromPython(item));
    return VbArray<Variant>(lower, std::move(values));
}

}  // namespace maroset::python
