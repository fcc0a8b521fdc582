#include "core/ScopedRuntime.h"

namespace maroset {

ScopedRuntime::ScopedRuntime(std::unique_ptr<Runtime> runtime)
    : runtime_(std::move(runtime)), previous_(Runtime::exchange(runtime_.get())) {}

ScopedRuntime::~ScopedRuntime() {
    runtime_.reset();  // still current while its nodes shut down
    Runtime::exchange(previous_);
}

}  // namespace maroset
