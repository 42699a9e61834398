// Project time: the frame duration of the current project, edit time to
// clock time through an output gearing, a monotonic millisecond clock and
// the comparison of two times.
#pragma once

#include "host/HostExport.h"

namespace Kv {

namespace CurrentProject {
HOST_API double getFrameDuration();
}

// How an output maps edit time to clock time: clock = edit * scale + offset.
// A default gearing translates unchanged.
struct OutputGearing {
  double scale = 1.0;
  double offsetSeconds = 0.0;
};

}  // namespace Kv

HOST_API double mPosn_Xlate_CelToClock(double editTime, const Kv::OutputGearing& gearing);
HOST_API double service_get_msecs_precise();

// True when a is before b. Exact: two times compare equal only when they are
// the same double, so an order built with it is the order of the values.
template <class T>
bool valLessThanVal(const T& a, const T& b) {
  return a < b;
}
