#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "lang/VbError.h"

namespace maroset {

// An array with its own lower and upper bound, as the system's arrays are: value reports are
// one-based, byte buffers zero-based, and several behaviours depend on the bounds themselves.
// An index outside the bounds fails with Subscript out of range (9). An array with no
// elements has upper bound lower - 1.
template <class T>
class VbArray {
  public:
    VbArray() = default;
    VbArray(int32_t lower, int32_t upper) { ReDim(lower, upper); }
    VbArray(int32_t lower, std::vector<T> items) : lower_(lower), items_(std::move(items)) {}

    int32_t LBound() const noexcept { return lower_; }
    int32_t UBound() const noexcept { return lower_ + static_cast<int32_t>(items_.size()) - 1; }
    int32_t size() const noexcept { return static_cast<int32_t>(items_.size()); }
    bool empty() const noexcept { return items_.empty(); }

    T& operator()(int32_t index) { return items_[offset(index)]; }
    const T& operator()(int32_t index) const { return items_[offset(index)]; }

    // ReDim: new bounds, every element reset.
    void ReDim(int32_t lower, int32_t upper) {
        const int64_t count = static_cast<int64_t>(upper) - lower + 1;
        if (count < 0) throw VbError(err::SubscriptOutOfRange);
        items_.assign(static_cast<size_t>(count), T{});
        lower_ = lower;
    }
    // ReDim Preserve: only the upper bound may move; elements kept where they still fit.
    void ReDimPreserve(int32_t upper) {
        const int64_t count = static_cast<int64_t>(upper) - lower_ + 1;
        if (count < 0) throw VbError(err::SubscriptOutOfRange);
        items_.resize(static_cast<size_t>(count));
    }

    const std::vector<T>& items() const noexcept { return items_; }
    auto begin() noexcept { return items_.begin(); }
    auto end() noexcept { return items_.end(); }
    auto begin() const noexcept { return items_.begin(); }
    auto end() const noexcept { return items_.end(); }

    friend bool operator==(const VbArray&, const VbArray&) = default;

  private:
    size_t offset(int32_t index) const {
        const int64_t off = static_cast<int64_t>(index) - lower_;
        if (off < 0 || off >= static_cast<int64_t>(items_.size()))
            throw VbError(err::SubscriptOutOfRange);
        return static_cast<size_t>(off);
    }

    int32_t lower_ = 0;
    std::vector<T> items_;
};

}  // namespace maroset
