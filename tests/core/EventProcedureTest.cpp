#include "core/EventProcedure.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/RuntimeFixture.h"

namespace maroset {
namespace {

using EventProcedureEdge = test::RuntimeFixture;

TEST_F(EventProcedureEdge, AnErrorLeavingAnEventProcedureIsTracedAndGoesNoFurther) {
    RunEventProcedure("Plc", [] { throw VbError(8002, "Cannot open serial device /dev/x"); });
    std::vector<std::string> lines;
    runtime().trace().setSink([&](std::string_view l) { lines.emplace_back(l); });
    RunEventProcedure("Plc", [] { throw VbError(9, {}, "Maroset.FrmNUVProSerial"); });
    bool ran = false;
    RunEventProcedure("Plc", [&] { ran = true; });
    EXPECT_TRUE(ran);
    EXPECT_EQ(lines, std::vector<std::string>{
                         "Plc: error 9 in Maroset.FrmNUVProSerial: Subscript out of range"});
}

}  // namespace
}  // namespace maroset
