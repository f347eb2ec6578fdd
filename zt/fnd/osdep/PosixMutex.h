#pragma once

#include <pthread.h>

#include "zt/fnd/osdep/ThreadAnnotations.h"

namespace zt::fnd::osdep {

// A plain POSIX mutex, not recursive: for what a condition waits on, or is taken across fork(). As
// a static it is ready before any initialiser and good after every destructor.
class CAPABILITY("mutex") PosixMutex {
 public:
  constexpr PosixMutex() = default;
  PosixMutex(const PosixMutex&) = delete;
  PosixMutex& operator=(const PosixMutex&) = delete;

  void lock() ACQUIRE() NO_THREAD_SAFETY_ANALYSIS { pthread_mutex_lock(&m_mutex); }
  void unlock() RELEASE() NO_THREAD_SAFETY_ANALYSIS { pthread_mutex_unlock(&m_mutex); }
  pthread_mutex_t* native() { return &m_mutex; }

 private:
  pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
};

}  // namespace zt::fnd::osdep
