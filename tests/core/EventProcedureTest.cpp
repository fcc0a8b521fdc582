#include "core/EventProcedure.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/IncidentRecorder.h"
#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using EventProcedureEdge = test::RuntimeFixture;

TEST_F(EventProcedureEdge, AnErrorLeavingAnEventProcedureIsTracedAndGoesNoFurther) {
    RunEventProcedure("Plc", [] { throw VbError(8002, "Cannot open serial device /dev/x"); });
    test::IncidentRecorder incidents;
    const std::vector<std::string>& lines = incidents.lines;
    RunEventProcedure("Plc", [] { throw VbError(9, {}, "Maroset.FrmNUVProSerial"); });
    bool ran = false;
    RunEventProcedure("Plc", [&] { ran = true; });
    EXPECT_TRUE(ran);
    EXPECT_EQ(lines, std::vector<std::string>{
                         "Plc: error 9 in Maroset.FrmNUVProSerial: Subscript out of range"});
}

}  // namespace
}  // namespace maroset
