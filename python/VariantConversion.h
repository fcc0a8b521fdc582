#pragma once

#include <pybind11/pybind11.h>

#include <cstdint>
#include <string>

#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset::python {

// Values between the library and Python. Empty is maroset.Empty, Null is None, Integer and
// Long are int, Single and Double float, Boolean bool, String str, arrays lists (first
// element first, whatever the lower bound). Text is bytes in the library: it is decoded as
// UTF-8 with surrogateescape, so bytes that are not UTF-8 come back unchanged when the str
// goes the other way. From Python, an int that fits 16 bits is an Integer, one that fits 32
// bits a Long, and a larger one fails with Overflow (6); a value of no Variant kind fails
// with Type mismatch (13).

// The one maroset.Empty object; made by the module when it is imported.
pybind11::object EmptyValue();
void SetEmptyValue(pybind11::object empty);

pybind11::object ToPython(const Variant& value);
Variant FromPython(pybind11::handle value);

pybind11::str TextToPython(const std::string& bytes);
std::string TextFromPython(pybind11::handle text);
// A path as str, bytes or os.PathLike, as the file system's bytes.
std::string PathFromPython(pybind11::handle path);

// A one-based report array as a list.
pybind11::list ToList(const VbArray<int32_t>& items);
pybind11::list ToList(const VbArray<Variant>& items);
// A Python sequence as an array with the given lower bound.
VbArray<Variant> ArrayFromPython(pybind11::handle sequence, int32_t lower);

}  // namespace maroset::python
