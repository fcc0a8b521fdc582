#pragma once

#include <memory>

#include "core/Runtime.h"

namespace maroset {

// Installs a runtime as the current one for its own lifetime; on destruction the runtime is
// torn down (nodes first) while still current, then the previous one is restored.
class ScopedRuntime {
  public:
    explicit ScopedRuntime(std::unique_ptr<Runtime> runtime);
    ~ScopedRuntime();
    ScopedRuntime(const ScopedRuntime&) = delete;
    ScopedRuntime& operator=(const ScopedRuntime&) = delete;

    Runtime& operator*() const { return *runtime_; }
    Runtime* operator->() const { return runtime_.get(); }

  private:
    std::unique_ptr<Runtime> runtime_;
    Runtime* previous_;
};

}  // namespace maroset
