#include <ctime>

#include "zt/fnd/osdep/MonotonicClock.h"

namespace zt::fnd::osdep {

std::uint64_t MonotonicTicks() {
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1000000000u +
         static_cast<std::uint64_t>(now.tv_nsec);
}

std::uint64_t MonotonicTicksPerSecond() { return 1000000000u; }

}  // namespace zt::fnd::osdep
