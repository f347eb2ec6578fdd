// pthread_mutex_timedlock waits by the time of day, which may be set while it waits. So it waits in
// slices, and the moment is compared with the monotonic clock: only a clock that is set back within
// a slice lengthens the wait.
#include <algorithm>
#include <ctime>

#include "zt/fnd/osdep/LockUntil.h"

namespace zt::fnd::osdep {
namespace {

constexpr int64_t kNanosecondsPerSecond = 1000000000;
constexpr int64_t kSliceNs = 5000000;

int64_t Now(clockid_t clock) {
  timespec now;
  clock_gettime(clock, &now);
  return int64_t{now.tv_sec} * kNanosecondsPerSecond + now.tv_nsec;
}

}  // namespace

bool LockUntil(pthread_mutex_t& mutex, int64_t momentNs) noexcept {
  for (;;) {
    const int64_t left = momentNs - Now(CLOCK_MONOTONIC);
    if (left <= 0) return pthread_mutex_trylock(&mutex) == 0;
    const int64_t end = Now(CLOCK_REALTIME) + std::min(left, kSliceNs);
    timespec moment;
    moment.tv_sec = static_cast<time_t>(end / kNanosecondsPerSecond);
    moment.tv_nsec = static_cast<long>(end % kNanosecondsPerSecond);
    if (pthread_mutex_timedlock(&mutex, &moment) == 0) return true;
  }
}

}  // namespace zt::fnd::osdep
