#pragma once

#include <string>
#include <vector>

#include "core/LinkStatus.h"

namespace maroset::gateway {

// The nodes' link status in Prometheus' text exposition format (version 0.0.4), one family
// per counter, labelled by node and driver:
//
//     maroset_values_total{node="Line1",driver="NUVABDF1"} 40
//     maroset_link_state{node="Line1",driver="NUVABDF1",state="up"} 1
//
// The link state is one series per state, 1 for the node's present state and 0 for the others,
// so a query can alert on state="down" directly.
class PrometheusText {
  public:
    static std::string Render(const std::vector<LinkStatus>& nodes);
};

}  // namespace maroset::gateway
