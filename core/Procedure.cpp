#include "core/Procedure.h"

#include <string>

#include "core/Runtime.h"

namespace maroset {

Procedure::Procedure(const char* module, const char* name, Trap trap)
    : module_(module),
      name_(name),
      trap_(trap),
      armed_(trap != Trap::Switched || Runtime::current().trap().enabled()) {}

void Procedure::stamp(VbError& e) const {
    if (e.source().empty()) e.setSource(std::string("Maroset.") + module_);
}

int16_t Procedure::resume(const VbError& e) {
    if (trap_ == Trap::ResumeNext) return 1;  // errors expected and ignored by design
    Runtime::current().linkStatus().StartError(e);  // a node starting: its driver did not
    return Runtime::current().trap().HandleError(module_, name_, e);
}

}  // namespace maroset
