#include "core/ValueReport.h"

#include <memory>
#include <vector>

#include "core/ClsNodeDBInterface.h"
#include "core/Driver.h"
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

void ReportValues(const Driver& from, VbArray<int32_t>& handles, int16_t count,
                  VbArray<Variant>& values) {
    Runtime& rt = Runtime::current();
    rt.reports().Values.raise(from.servedNode(), handles, count, values);
    if (auto db = reportTarget()) db->NewValue(handles, count, values);
}

void ReportValues(const Driver& from, VbArray<int32_t>& handles, VbArray<Variant>& values) {
    ReportValues(from, handles, CInt(Variant(handles.size())), values);
}

void ReportValue(const Driver& from, int32_t handle, const Variant& value) {
    VbArray<int32_t> handles(1, std::vector<int32_t>{handle});
    VbArray<Variant> values(1, std::vector<Variant>{value});
    ReportValues(from, handles, 1, values);
}

void ReportError(const Driver& from, const std::string& driver, const std::string& fromSub,
                 const std::string& message) {
    Runtime::current().reports().Errors.raise(from.servedNode(), driver, fromSub, message);
    if (auto db = reportTarget()) db->NUVError(driver, fromSub, message);
}

}  // namespace maroset
