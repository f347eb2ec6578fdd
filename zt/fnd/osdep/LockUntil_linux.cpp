#include <ctime>

#include "zt/fnd/osdep/LockUntil.h"

namespace zt::fnd::osdep {

bool LockUntil(pthread_mutex_t& mutex, int64_t momentNs) noexcept {
  constexpr int64_t kNanosecondsPerSecond = 1000000000;
  timespec end;
  end.tv_sec = static_cast<time_t>(momentNs / kNanosecondsPerSecond);
  end.tv_nsec = static_cast<long>(momentNs % kNanosecondsPerSecond);
  return pthread_mutex_clocklock(&mutex, CLOCK_MONOTONIC, &end) == 0;
}

}  // namespace zt::fnd::osdep
