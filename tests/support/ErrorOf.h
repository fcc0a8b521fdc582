#pragma once

#include <cstdint>

#include "lang/VbError.h"

namespace maroset::test {

// The number of the run-time error that f fails with, or 0 when it succeeds.
template <class F>
int32_t errorOf(F&& f) {
    try {
        f();
    } catch (const VbError& e) {
        return e.number();
    }
    return 0;
}

}  // namespace maroset::test
