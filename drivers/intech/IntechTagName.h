#pragma once

#include <string>
#include <string_view>

namespace maroset {

// Intech tag names: characters 1-2 the station address, 3-5 the kind, 6 onward the point
// number ("01LAI3", "01EAI17", "02LDI4", "01LDO1").
//
//   LAI 1-16   analog inputs, four per group: "EX E5 00:" .. "EX E5 03:"
//   LDI, LDO   digital inputs and outputs, read together: "EX DI:"
//   EAI 1-64   extended analog inputs, sixteen per block: "EX E1:" .. "EX E4:"
//
// The kind is compared in upper case; the point number as a number, so "01LAI1.5" has no
// command and "01LAIx" fails with Type mismatch (13). Digital points are not checked at all.
class IntechTagName {
  public:
    // The read command that serves the tag, "@" + address + command text ("@01EX E5 00:"),
    // or empty text when the kind or point is outside the table.
    static std::string ReadCommand(std::string_view TagName);
};

}  // namespace maroset
