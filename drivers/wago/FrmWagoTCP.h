#pragma once

#include "lang/Event.h"
#include "lang/Subscription.h"
#include "platform/EventLoop.h"
#include "platform/Timer.h"

namespace maroset {

// The hidden owner of the coupler driver's scan timer. TmrScanRate is designed disabled with
// an interval of 2000 ms; each of its ticks raises PollTime, on which the driver scans.
//
// A PollTime handler may destroy this object (the driver shuts down while it scans).
class FrmWagoTCP {
  public:
    explicit FrmWagoTCP(platform::EventLoop& loop);
    FrmWagoTCP(const FrmWagoTCP&) = delete;
    FrmWagoTCP& operator=(const FrmWagoTCP&) = delete;

    platform::Timer TmrScanRate;
    Event<> PollTime;

  private:
    void TmrScanRate_Timer();

    Subscription tick_;
};

}  // namespace maroset
