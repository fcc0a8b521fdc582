#pragma once

#include <cstdint>
#include <string>

#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

// How drivers report upward: through the nodeDB of the hidden façade (created on first use),
// which raises ValueChange or DriverError to every host façade before these return.

// One value report with one-based arrays of handles and values of the same length.
void ReportValues(VbArray<int32_t>& handles, VbArray<Variant>& values);
// A report of a single tag: handles (h), count 1, values (v).
void ReportValue(int32_t handle, const Variant& value);
// An error report: driver label, "Class.Procedure", message.
void ReportError(const std::string& driver, const std::string& fromSub, const std::string& message);

}  // namespace maroset
