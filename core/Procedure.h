#pragma once

#include <cstdint>

#include "lang/VbError.h"

namespace maroset {

// One procedure of the system under its error trap. Each statement of the body runs through
// run(); what happens when a statement fails depends on the procedure's trap:
// - Switched (the usual): with the trap switch off (tested on entry) the error propagates to
//   the caller unchanged; with it on, HandleError is asked and the statement is retried (0),
//   skipped (1), or the rest of the procedure is skipped (anything else).
// - Always: as Switched with the switch on, whatever the switch says.
// - ResumeNext: the failing statement is skipped, nothing is logged ("ignore errors and
//   continue").
// An error that leaves a procedure carries the source "Maroset.<module>" unless it had one.
//
//     void node::AddTag(int32_t TagID, const std::string& TagAddress) {
//         Procedure proc("node", "AddTag");
//         proc.run([&] { if (!initialised_) Init(); });
//         proc.run([&] { driver_->AddItem(TagAddress, CInt(TagID)); });
//     }
class Procedure {
  public:
    enum class Trap { Switched, Always, ResumeNext };

    Procedure(const char* module, const char* name, Trap trap = Trap::Switched);

    template <class Statement>
    void run(Statement&& statement) {
        if (left_) return;
        if (!armed_) {
            try {
                statement();
            } catch (VbError& e) {
                stamp(e);
                throw;
            }
            return;
        }
        for (;;) {
            try {
                statement();
                return;
            } catch (VbError& e) {
                stamp(e);
                switch (resume(e)) {
                    case 0:
                        continue;
                    case 1:
                        return;
                    default:
                        left_ = true;
                        return;
                }
            }
        }
    }

    // True once the handler answered "leave": the remaining statements do not run.
    bool left() const { return left_; }

  private:
    void stamp(VbError& e) const;
    int16_t resume(const VbError& e);

    const char* module_;
    const char* name_;
    Trap trap_;
    bool armed_;
    bool left_ = false;
};

}  // namespace maroset
