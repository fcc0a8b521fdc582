#include "drivers/wago/FrmWagoTCP.h"

namespace maroset {

FrmWagoTCP::FrmWagoTCP(platform::EventLoop& loop) : TmrScanRate(loop) {
    TmrScanRate.Interval(2000);
    TmrScanRate.Enabled(false);
    tick_ = TmrScanRate.Tick.subscribe([this] { TmrScanRate_Timer(); });
}

void FrmWagoTCP::TmrScanRate_Timer() {
    PollTime.raise();
}

}  // namespace maroset
