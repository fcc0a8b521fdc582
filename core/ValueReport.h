#pragma once

#include <cstdint>
#include <string>

#include "lang/Variant.h"
#include "lang/VbArray.h"

namespace maroset {

class Driver;

// How drivers report upward: through the nodeDB of the hidden façade (created on first use),
// which raises ValueChange or DriverError to every host façade before these return. Each
// report is also told to the runtime's ReportTap under the node of the driver that made it.

// One value report with one-based arrays of handles and values of the same length.
void ReportValues(const Driver& from, VbArray<int32_t>& handles, VbArray<Variant>& values);
// The same with the count as the driver gives it (16-bit; it may differ from the arrays').
void ReportValues(const Driver& from, VbArray<int32_t>& handles, int16_t count,
                  VbArray<Variant>& values);
// A report of a single tag: handles (h), count 1, values (v).
void ReportValue(const Driver& from, int32_t handle, const Variant& value);
// An error report: driver label, "Class.Procedure", message.
void ReportError(const Driver& from, const std::string& driver, const std::string& fromSub,
                 const std::string& message);

}  // namespace maroset
