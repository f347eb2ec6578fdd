#pragma once

#include <pthread.h>

#include <cstdint>

namespace zt::fnd::osdep {

// Platform seam: locks the mutex if it becomes free before the moment, in nanoseconds of
// CLOCK_MONOTONIC; one that is free is locked also after it. False if it is not locked. Callers are
// handlers of fork(): no memory is allocated.
bool LockUntil(pthread_mutex_t& mutex, int64_t momentNs) noexcept;

}  // namespace zt::fnd::osdep
