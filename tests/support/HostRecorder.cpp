#include "support/HostRecorder.h"

namespace maroset::test {

HostRecorder::HostRecorder() {
    values_ = host.ValueChange.subscribe(
        [this](VbArray<int32_t>& ids, int16_t n, VbArray<Variant>& values) {
            changes.push_back({ids.items(), n, values.items(), ids.LBound(), values.LBound()});
        });
    errors_ = host.DriverError.subscribe(
        [this](const std::string& d, const std::string& f, const std::string& m) {
            errors.push_back({d, f, m});
        });
}

}  // namespace maroset::test
