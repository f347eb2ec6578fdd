#include <ctime>

#include "zt/fnd/osdep/MonotonicClock.h"

namespace zt::fnd::osdep {

uint64_t MonotonicTicks() {
  timespec now;
  // The result is not read: the clock exists on every Linux. It stops while the machine sleeps, and
  // a wait measured by it then takes as long as the process has run.
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<uint64_t>(now.tv_sec) * 1000000000u + static_cast<uint64_t>(now.tv_nsec);
}

uint64_t MonotonicTicksPerSecond() { return 1000000000u; }

}  // namespace zt::fnd::osdep
