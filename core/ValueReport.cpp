#include "core/ValueReport.h"

#include <memory>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/Runtime.h"
#include "core/nodeDB.h"
#include "lang/Conversions.h"

namespace maroset {

namespace {

// The hidden façade's nodeDB, held for the length of the report: a host handler may replace
// or release everything else.
std::shared_ptr<nodeDB> reportTarget() {
    return Runtime::current().hiddenInterface().nodeDB();
}

}  // namespace

void ReportValues(VbArray<int32_t>& handles, VbArray<Variant>& values) {
    const int16_t count = CInt(Variant(handles.size()));
    if (auto db = reportTarget()) db->NewValue(handles, count, values);
}

void ReportValue(int32_t handle, const Variant& value) {
    VbArray<int32_t> handles(1, std::vector<int32_t>{handle});
    VbArray<Variant> values(1, std::vector<Variant>{value});
    ReportValues(handles, values);
}

void ReportError(const std::string& driver, const std::string& fromSub,
                 const std::string& message) {
    if (auto db = reportTarget()) db->NUVError(driver, fromSub, message);
}

}  // namespace maroset
