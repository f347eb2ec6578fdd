#pragma once

#include <pthread.h>

namespace zt {
namespace fnd {
namespace osdep {

// Holds a plain POSIX mutex for a scope: one that a condition waits on, or is taken across fork().
class PosixMutexHold {
 public:
  explicit PosixMutexHold(pthread_mutex_t& mutex) : m_mutex(mutex) { pthread_mutex_lock(&m_mutex); }
  ~PosixMutexHold() { pthread_mutex_unlock(&m_mutex); }
  PosixMutexHold(const PosixMutexHold&) = delete;
  PosixMutexHold& operator=(const PosixMutexHold&) = delete;

 private:
  pthread_mutex_t& m_mutex;
};

}  // namespace osdep
}  // namespace fnd
}  // namespace zt
